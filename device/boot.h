// SPDX-License-Identifier: Apache-2.0
// The boot tool's own start-up sequence run on a simulated tree, and what
// it does there, read off the run: the links, record, messages and exit
// status it leaves, and the reasons it gave itself as it decided.
#ifndef TZLINKS_DEVICE_BOOT_H
#define TZLINKS_DEVICE_BOOT_H

#include "device/simulation.h"

#include <optional>
#include <string>
#include <utility>
#include <vector>

using velm_text = std::optional<std::string>; // absent or not understood: none

class velm_dataset;

// A dataset as the boot tool's own code reads it, and as the boot judged it.
struct velm_dataset_facts {
    bool present = false;
    std::string root; // empty for the system dataset
    std::string version;
    bool version_understood = false;
    std::string icu_schema;
    bool compatible = false; // with the system dataset
    bool newer = false;      // latest: than the current dataset
    bool older = false;      // than the system's
    bool unreadable = false; // something of its data could not be read
};
velm_dataset_facts facts_of(const velm_dataset& dataset);

// One run of the boot tool on the simulation.
struct velm_run {
    std::string action; // keep, adopt (the update tz_latest names), reset or fail
    velm_text zoneinfo, icutz, localtime, record;
    std::vector<std::string> messages; // what the run writes on standard error
    int exit_status = 0;
    // Its reasons. The dataset the zoneinfo link names, judged against the
    // system's (absent when the run never got so far), and whether the
    // link named data the boot knows; the update tz_latest names, judged.
    bool understood = true;
    velm_dataset_facts system, current, latest;
    bool kept = false, adopted = false; // the current dataset; the latest
    bool abandoned = false;             // a failure ended the decision: reset to the system data
    // The changes the tree refused the run, in order: path and error.
    std::vector<std::pair<std::string, int>> refused;
};
velm_run simulate_boot(velm_simulation& tree);

// Why the update tz_latest names is not adopted, or not for good, in the
// boot's own terms: refused by the next boot, or adopted and set aside by
// the boot after. id is latest-no-icu, latest-other-schema,
// latest-older-than-system or latest-older; reason completes "tz_latest
// names V, ...". None when the boots keep it, or judged none.
struct velm_refusal {
    std::string id, reason;
};
std::optional<velm_refusal> refusal_of(const velm_run& next, const velm_run* after);

// While it lives, standard error is caught and the program is named as the
// boot tool: the product code warns as it does at boot, and those are the
// messages a boot would write.
class velm_caught_messages {
  public:
    velm_caught_messages();
    ~velm_caught_messages();
    velm_caught_messages(const velm_caught_messages&) = delete;
    velm_caught_messages& operator=(const velm_caught_messages&) = delete;
    std::vector<std::string> lines() const;

  private:
    int saved, caught;
    char* name;
};

// A link's target in the simulation; none when no link stands there or it
// cannot be read.
velm_text link_at(velm_simulation& tree, const std::string& path);

#endif
