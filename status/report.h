// SPDX-License-Identifier: Apache-2.0
// What tzlinks-status says of a device tree: the links as they stand, the
// datasets they name, what the next boot will leave, and what is wrong.
#ifndef TZLINKS_STATUS_REPORT_H
#define TZLINKS_STATUS_REPORT_H

#include "status/simulation.h"

#include <optional>
#include <string>
#include <vector>

using velm_text = std::optional<std::string>; // absent or not understood: none

struct velm_dataset_facts {
    bool present = false;
    std::string root; // empty for the system dataset
    std::string version;
    bool version_understood = false;
    std::string icu_schema;
    bool compatible = false; // with the system dataset
    bool newer = false;      // latest: than the dataset in use
    bool older = false;      // live: than the system's
};

struct velm_finding {
    std::string id, severity, message, repair; // severity: error, warning or note
};

struct velm_report {
    velm_text zoneinfo, icutz, localtime, tz_latest, record;
    bool zoneinfo_understood = false; // names an update's or the system's tz database
    std::string localtime_zone;       // what follows the live tree's prefix, if anything
    velm_dataset_facts live, system, latest;
    struct {
        std::string action; // keep, adopt (the update tz_latest names), reset or fail
        velm_text zoneinfo, icutz, localtime, record;
        std::vector<std::string> messages; // what the run writes on standard error
        int exit_status = 0;
    } next_boot;
    std::vector<velm_finding> findings;
    std::string health; // healthy, degraded or broken
};

velm_report make_report(velm_simulation& tree);

std::string text_report(const velm_report& report);
std::string json_report(const velm_report& report);

#endif
