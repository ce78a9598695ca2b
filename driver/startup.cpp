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
read_current_path()
{
    try {
        return current_dataset_path();
    } catch (...) {
        warn("%s", velm_says::invalid_current);
        force_system_dataset();
        return std::string();
    }
}

// Checks the dataset in use against the system partition's and adopts the
// newest update when it fits. Any failure escapes to the caller.
static void
decide()
{
    velm_dataset system;
    std::string latest_path = latest_dataset_path();
    std::string current_path = read_current_path();

    velm_dataset current(current_path);
    const velm_dataset* in_use = &current;
    if (!current.compatible(system) || system > current) {
        warn("%s", velm_says::incompatible);
        force_system_dataset();
        in_use = &system;
    }
    if (latest_path.empty())
        return;

    // Compared with the current dataset even when that was just rejected:
    // an update newer than it but older than the system data still wins.
    velm_dataset latest(latest_path);
    if (latest.compatible(system) && latest > current) {
        latest.activate();
        write_version_diff_record(in_use->get_version_string(), latest.get_version_string());
    } else {
        warn("%s: %s vs. %s", velm_says::refused, latest.get_version_string().c_str(),
             current.get_version_string().c_str());
    }
}

int
run_startup_sequence()
{
    protect_data_directories();
    migrate_icu_link();
    (void)system_calls().remove(velm_path::legacy_icu);

    try {
        decide();
    } catch (...) {
        warn("%s", velm_says::unable);
        try {
            force_system_dataset();
        } catch (...) {
            warn("%s", velm_says::last_resort);
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
