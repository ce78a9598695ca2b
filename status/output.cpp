// SPDX-License-Identifier: Apache-2.0
#include "status/report.h"

#include "device/text.h"
#include "support/paths.h"

#include <algorithm>

static std::string
json(bool value)
{
    return value ? "true" : "false";
}

static std::string
json(const velm_dataset_facts& d, const char* extra)
{
    if (!d.present)
        return "null";
    // The system partition's data has no root of its own: null, not "".
    std::string out = "{\"root\":" + json_text(d.root.empty() ? velm_text() : d.root) +
                      ",\"version\":" + json_text(d.version) +
                      ",\"version_understood\":" + json(d.version_understood) +
                      ",\"icu_schema\":" + json_text(d.icu_schema) +
                      ",\"unreadable\":" + json(d.unreadable);
    if (std::string(extra) == "live")
        out += ",\"compatible\":" + json(d.compatible) + ",\"older\":" + json(d.older);
    if (std::string(extra) == "latest")
        out += ",\"compatible\":" + json(d.compatible) + ",\"newer\":" + json(d.newer);
    return out + "}";
}

std::string
json_findings(const std::vector<velm_finding>& findings, const std::string& root)
{
    std::string out;
    for (const velm_finding& f : findings) {
        std::string commands;
        for (const velm_command& command : f.commands.value_or(velm_commands()))
            commands += (commands.empty() ? "" : ",") + json_text(shell_text(command, root), true);
        out += std::string(out.empty() ? "" : ",") + "{\"id\":" + json_text(f.id) +
               ",\"severity\":" + json_text(f.severity) + ",\"message\":" + json_text(f.message) +
               ",\"commands\":" + (f.commands ? "[" + commands + "]" : "null") +
               ",\"manual\":" + json_text(f.manual.empty() ? velm_text() : f.manual) +
               ",\"verified\":" + json(f.verified) + "}";
    }
    return "[" + out + "]";
}

std::string
json_report(const velm_report& r)
{
    std::string remaining;
    for (const std::string& id : r.repaired_findings)
        remaining += (remaining.empty() ? "" : ",") + json_text(id);
    return "{\"format\":" + std::to_string(report_format) +
           ",\"zoneinfo\":" + json_text(r.zoneinfo) + ",\"icutz\":" + json_text(r.icutz) +
           ",\"localtime\":" + json_text(r.localtime) + ",\"tz_latest\":" + json_text(r.tz_latest) +
           ",\"record\":" + json_text(r.record) + ",\"localtime_zone\":" +
           json_text(r.localtime_zone.empty() ? velm_text() : r.localtime_zone) +
           ",\"live\":" + json(r.live, "live") + ",\"system\":" + json(r.system, "") +
           ",\"latest\":" + json(r.latest, "latest") + ",\"next_boot\":" + json_run(r.next_boot) +
           ",\"findings\":" + json_findings(r.findings, r.root) +
           ",\"health\":" + json_text(r.health) + R"(,"after_repair":{"health":)" +
           json_text(r.repaired_health) + ",\"findings\":[" + remaining + "]}}\n";
}

static std::string
dataset(const velm_dataset_facts& d)
{
    return (d.root.empty() ? "the system data " : "update ") + shown(d.version) +
           (d.version_understood ? "" : " (not a version)") + ", ICU schema " +
           (d.icu_schema.empty() ? (d.unreadable ? "unknown" : "none") : shown(d.icu_schema)) +
           (d.unreadable ? " (some of its data cannot be read)" : "");
}

// How a finding is repaired, in one line or a line for each command.
static std::string
repair(const velm_finding& f, const std::string& root)
{
    if (!f.commands)
        return f.manual.empty() ? "Repair: none needed." : "Needs: " + shown(f.manual) + ".";
    if (f.commands->empty())
        return f.by_earlier
                   ? "Repair: nothing more to run; the commands above, then one boot, do it."
                   : "Repair: nothing to run; the next boot does it.";
    std::string out = f.verified ? "Repair:" : "Repair (not shown to work):";
    for (const velm_command& command : *f.commands)
        out += "\n      " + shown(shell_text(command, root));
    return out;
}

std::string
text_findings(const std::vector<velm_finding>& findings, const std::string& root)
{
    std::string out;
    for (const velm_finding& f : findings) {
        out += "  " + f.severity + " " + f.id + ": " + shown(f.message) + "\n";
        out += "    " + repair(f, root) + "\n";
    }
    return out;
}

std::string
text_report(const velm_report& r)
{
    std::string out =
        "Now\n  In use: " +
        (r.live.present ? dataset(r.live) : std::string("no data the boot tool understands")) +
        ".\n  System: " +
        (r.system_missing ? "none: " + std::string(velm_path::system_zoneinfo) + " is no directory"
         : r.system.present ? dataset(r.system)
                            : std::string("none that can be read")) +
        ".\n";
    if (r.latest.present)
        out += "  Latest: " + dataset(r.latest) + "; " +
               (r.latest.compatible ? "compatible with" : "incompatible with") +
               " the system data, " + (r.latest.newer ? "newer" : "not newer") +
               " than the data in use.\n";
    out += text_link("zoneinfo", r.zoneinfo) + text_link("icutz", r.icutz) +
           text_link("localtime", r.localtime) + text_link("tz_latest", r.tz_latest);
    if (!r.localtime_zone.empty())
        out += "  The zone is " + shown(r.localtime_zone) + ".\n";
    out += r.record_unreadable ? "  The record of the last adoption cannot be read.\n"
           : r.record ? "  The record of the last adoption reads " + shown(*r.record) + ".\n"
                      : "  There is no record of an adoption.\n";
    out += "Next boot\n" + text_run(r.next_boot);
    out += r.findings.empty() ? "Findings: none.\n" : "Findings\n";
    out += text_findings(r.findings, r.root);
    bool any = false;
    for (const velm_finding& f : r.findings)
        any = any || (f.commands && !f.commands->empty());
    out += "Health: " + r.health + ".\n";
    if (any)
        out += "After these repairs and one boot: " + r.repaired_health + ".\n";
    return out;
}

std::string
commands_report(const velm_report& r)
{
    std::string out;
    for (const velm_finding& f : r.findings) {
        // What the simulation did not show to work is shown, never run.
        for (const velm_command& command : f.commands.value_or(velm_commands()))
            out += (f.verified ? "" : "# not shown to work: ") + shell_text(command, r.root) + "\n";
    }
    return out;
}
