// SPDX-License-Identifier: Apache-2.0
// What tzlinks-status says of a device tree: the links as they stand, the
// datasets they name, what the next boot will leave, what is wrong, and the
// commands that repair it.
#ifndef TZLINKS_STATUS_REPORT_H
#define TZLINKS_STATUS_REPORT_H

#include "device/boot.h"
#include "device/device.h"
#include "device/simulation.h"
#include "device/text.h"
#include "status/commands.h"

#include <optional>
#include <string>
#include <vector>

struct velm_finding {
    std::string id, severity, message; // severity: error, warning or note
    // What a person runs to repair it, in order, followed by one boot; none
    // when only a person can supply what manual names.
    std::optional<velm_commands> commands;
    std::string manual;
    std::string subject;   // the path it is about: with the id, what tells two apart
    bool verified = false; // the commands, simulated, clear it and break nothing
    // Repairs to try: the one whose outcome the simulation shows best
    // becomes commands; when none works, manual (or the first, unverified).
    std::vector<velm_commands> tries;
    bool by_earlier = false; // nothing more to run, once the commands above have run
};

struct velm_report {
    std::string root; // the directory read, as the commands name it: "" for /
    velm_text zoneinfo, icutz, localtime, tz_latest, record;
    bool record_unreadable = false;
    bool system_missing = false;      // no directory of system data to fall back on
    bool zoneinfo_understood = false; // names an update's or the system's tz database
    std::string localtime_zone;       // what follows the live tree's prefix, if anything
    std::string zone;                 // the zone the device's programs use, by its name
    velm_dataset_facts live, system, latest;
    velm_run next_boot;
    std::optional<velm_run> after_next; // the boot after it, when the next one succeeds
    std::vector<velm_finding> findings;
    std::string health; // healthy, degraded or broken
    // The device after every finding's commands and one boot, as simulated.
    std::string repaired_health;
    std::vector<std::string> repaired_findings;
    // The simulation as it stands, and as the next boot leaves it.
    velm_simulation::changes now, next;
};

// The report of the tree as the simulation shows it now; the simulation is
// left as it was found. root is how commands name the tree.
velm_report make_report(velm_simulation& tree, const velm_device& device);

// The whole report of the tree as the simulation stands, but for the
// repairs' search; the simulation is left as it was found.
velm_report survey(velm_simulation& tree, const std::string& root);
// Its findings, for a report of a tree changed in the simulation.
void find_problems(velm_simulation& tree, velm_report& r);
// The repairs of the report's findings, checked on the simulation.
void check_repairs(velm_simulation& tree, velm_report& r);

// The version of the JSON report's contract (docs/status.schema.json):
// raised whenever a change could break a reader of the one before.
const int report_format = 2;

std::string text_report(const velm_report& report);
std::string json_report(const velm_report& report);

// The report in Prometheus's text exposition format, and its atomic write
// into a textfile collector's directory (warns when it fails).
std::string metrics_report(const velm_report& report);
bool write_metrics(const std::string& directory, const std::string& text);
// Every finding's commands, in the report's order: a script for sh -e.
std::string commands_report(const velm_report& report);

#endif
