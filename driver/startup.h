// SPDX-License-Identifier: Apache-2.0
#ifndef TZLINKS_DRIVER_STARTUP_H
#define TZLINKS_DRIVER_STARTUP_H

class velm_dataset;

// Told what the start-up sequence decides, and why, as it decides it:
// tzlinks-status and tzlinks-update watch the sequence run on a simulated
// tree and read the boot's reasons off it. The boot tool installs none.
class velm_startup_watcher {
  public:
    // The zoneinfo link names no data the boot knows: the system's stands
    // in for it.
    virtual void not_understood() = 0;
    // The dataset the zoneinfo link names, and whether it is compatible
    // with the system's, older, and so kept.
    virtual void current(const velm_dataset& current, const velm_dataset& system, bool compatible,
                         bool older, bool kept) = 0;
    // The update tz_latest names: whether it is compatible with the system's
    // data, newer than the current dataset, and so adopted.
    virtual void latest(const velm_dataset& latest, const velm_dataset& system, bool compatible,
                        bool newer, bool adopted) = 0;
    // A failure ended the decision, which then resets to the system data.
    virtual void abandoned() = 0;

  protected:
    ~velm_startup_watcher() = default;
};

// One whole run of the tool; returns the exit status: 0 whenever the run
// reaches its end, errno (or last_resort_unknown_status) when even the
// last-resort reset fails, and the run stops there.
int run_startup_sequence(velm_startup_watcher* watcher = nullptr);

#endif
