// SPDX-License-Identifier: Apache-2.0
// The judgement of an update: the boot's own start-up sequence run on a
// simulation of the device with the update staged and named by tz_latest.
#include "update/update.h"

#include "support/paths.h"
#include "support/prefix.h"

#include <algorithm>

// What the report says of tz_latest that the update's own examination
// does not say already: why the boot would not adopt it, in its terms.
static bool
said_by_the_boot(const velm_finding& finding)
{
    static const char* const own[] = {"latest-not-a-version", "latest-no-icu", "latest-in-use",
                                      "latest-missing", "latest-trailing-slash"};
    return has_prefix(finding.id, "latest-") &&
           std::find(std::begin(own), std::end(own), finding.id) == std::end(own);
}

velm_judgement
judge(const velm_device& device, int src, const std::string& name, const std::string& version)
{
    velm_judgement j;
    j.version = version;
    velm_simulation tree(device.fd);
    // The device's zone: what its localtime link names in the live tree.
    velm_entry localtime = tree.look(velm_path::localtime_link);
    std::string live = std::string(velm_path::zoneinfo_link) + "/";
    std::string zone =
        localtime.kind == velm_entry::link && has_prefix(localtime.text, live.c_str())
            ? localtime.text.substr(live.size())
            : "";
    j.problems = examine_source(src, name, version, zone);
    std::string root = velm_path::updates + version;
    tree.graft(root, src);
    tree.apply({velm_command::symlink_to, root, velm_path::latest_link});
    velm_report staged = make_report(tree, device.root);
    for (const velm_finding& finding : staged.findings) {
        if (said_by_the_boot(finding))
            j.problems.push_back(finding);
    }
    j.next_boot = staged.next_boot;
    j.adopts =
        staged.next_boot.action == "adopt" && staged.next_boot.zoneinfo == root + "/zoneinfo";
    if (!j.adopts && j.problems.empty()) {
        velm_finding found;
        found.severity = "warning", found.id = "source-not-adopted", found.subject = name;
        found.message = "The next boot does not adopt it: see what it says.";
        found.manual = "an update the next boot adopts";
        j.problems.push_back(found);
    }
    simulate_boot(tree);
    j.then = make_report(tree, device.root);
    bool warned = std::any_of(j.then.findings.begin(), j.then.findings.end(),
                              [](const velm_finding& f) { return f.severity != "note"; });
    j.verdict = !j.problems.empty() ? refused : warned ? adopted_with_warnings : adopted_clean;
    return j;
}

static std::string
warned_ids(const velm_report& r, bool as_json)
{
    std::string ids;
    for (const velm_finding& f : r.findings) {
        if (f.severity != "note")
            ids += (ids.empty() ? "" : as_json ? "," : ", ") + (as_json ? json_text(f.id) : f.id);
    }
    return ids;
}

std::string
judgement_text(const velm_judgement& j, const std::string& name, const velm_device& device)
{
    std::string out = "Update " + name + " as " + j.version + "\n";
    out += j.adopts ? "  The next boot adopts it.\n" : "  The next boot does not adopt it.\n";
    out += "Next boot\n" + text_run(j.next_boot);
    out += j.problems.empty() ? "Problems: none.\n" : "Problems\n";
    out += text_findings(j.problems, device.root);
    std::string warnings = warned_ids(j.then, false);
    if (j.adopts)
        out += "Then: " + j.then.health + (warnings.empty() ? "" : " (" + warnings + ")") + ".\n";
    return out;
}

std::string
judgement_json(const velm_judgement& j, const std::string& name, const velm_device& device)
{
    return "{\"source\":" + json_text(name) + ",\"version\":" + json_text(j.version) +
           ",\"adopts\":" + (j.adopts ? "true" : "false") +
           ",\"next_boot\":" + json_run(j.next_boot) +
           ",\"problems\":" + json_findings(j.problems, device.root) + R"(,"then":{"health":)" +
           json_text(j.then.health) + ",\"warnings\":[" + warned_ids(j.then, true) + "]}}\n";
}
