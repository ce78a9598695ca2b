// SPDX-License-Identifier: Apache-2.0
#include "driver/startup.h"

#include "dataset/dataset.h"
#include "driver/housekeeping.h"
#include "driver/localtime.h"

#include "support/fs.h"
#include "support/paths.h"

#include <cerrno>
#include <err.h>

// Exit status when even the last-resort reset fails and errno cannot serve
// as the status (0, or above 255). Not an errno value on any platform this
// tool runs on, so it is never mistaken for one.
static const int last_resort_unknown_status = 255;

// Names the last adoption: "<in use before>_<adopted>", no line end. A
// record that cannot be written is not worth a message: the adoption itself
// has already happened.
static void
write_version_diff_record(const std::string& before, const std::string& adopted)
{
    velm_fs::write_own_file(velm_path::record, before + "_" + adopted);
}

// Reads the zoneinfo link; a link that is missing or not understood puts
// the system partition's data in place and is treated as naming it.
static std::string
read_current_path(velm_startup_watcher* watcher)
{
    try {
        return current_dataset_path();
    } catch (...) {
        warn("Invalid current symlinks; resetting to system partition");
        if (watcher != nullptr)
            watcher->not_understood();
        force_system_dataset();
        return std::string();
    }
}

// Checks the dataset in use against the system partition's and adopts the
// newest update when it fits. Any failure escapes to the caller.
static void
decide(velm_startup_watcher* watcher)
{
    velm_dataset system;
    std::string latest_path = latest_dataset_path();
    std::string current_path = read_current_path(watcher);

    velm_dataset current(current_path);
    const velm_dataset* in_use = &current;
    bool compatible = current.compatible(system), older = system > current;
    bool kept = compatible && !older;
    if (watcher != nullptr)
        watcher->current(current, system, compatible, older, kept);
    if (!kept) {
        warn("Symlink points at data incompatible with installed system");
        force_system_dataset();
        in_use = &system;
    }
    if (latest_path.empty())
        return;

    // Compared with the current dataset even when that was just rejected:
    // an update newer than it but older than the system data still wins.
    velm_dataset latest(latest_path);
    compatible = latest.compatible(system);
    bool newer = latest > current, adopted = compatible && newer;
    if (watcher != nullptr)
        watcher->latest(latest, system, compatible, newer, adopted);
    if (adopted) {
        latest.activate();
        write_version_diff_record(in_use->get_version_string(), latest.get_version_string());
    } else {
        warn("New update not compatible or older version: %s vs. %s",
             latest.get_version_string().c_str(), current.get_version_string().c_str());
    }
}

int
run_startup_sequence(velm_startup_watcher* watcher)
{
    protect_data_directories();
    migrate_icu_link();
    (void)system_calls().remove(velm_path::legacy_icu);

    try {
        decide(watcher);
    } catch (...) {
        warn("Unable to locate data; resetting to system partition");
        if (watcher != nullptr)
            watcher->abandoned();
        try {
            force_system_dataset();
        } catch (...) {
            warn("Last resort force_system_dataset() failed");
            // Without working links there is nothing sensible left to do,
            // not even the localtime repair; errno is the only account of
            // why.
            int status = errno;
            return status >= 1 && status <= 255 ? status : last_resort_unknown_status;
        }
    }

    try {
        correct_localtime_symlink();
    } catch (...) {
        warn("correct_localtime_symlink() failed");
    }
    return 0;
}
