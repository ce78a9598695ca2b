// SPDX-License-Identifier: Apache-2.0
#include "status/report.h"

#include "dataset/dataset.h"
#include "dataset/icu.h"
#include "driver/startup.h"
#include "support/paths.h"
#include "support/prefix.h"

#include <cerrno>
#include <err.h>
#include <memory>
#include <set>
#include <sys/mman.h>
#include <sysexits.h>
#include <unistd.h>

// The dataset at root as the boot tool's own code builds it; none for a bad
// path, or a version number beyond 32 bits.
static velm_dataset_facts
facts_at(const std::string& root)
{
    try {
        return facts_of(velm_dataset(root));
    } catch (...) {
        return velm_dataset_facts();
    }
}

// The links, the record and the three datasets as they stand, read as the
// boot tool reads them, with its own code; the datasets then as the next
// boot judges them.
static void
read_state(velm_simulation& tree, velm_report& r)
{
    r.zoneinfo = link_at(tree, velm_path::zoneinfo_link);
    r.icutz = link_at(tree, velm_path::icutz_link);
    r.localtime = link_at(tree, velm_path::localtime_link);
    r.tz_latest = link_at(tree, velm_path::latest_link);
    r.system_missing = tree.look(velm_path::system_zoneinfo, true).kind != velm_entry::directory;
    r.record = tree.read(velm_path::record, longest_text + 1);
    if (tree.look(velm_path::record).kind != velm_entry::file)
        r.record.reset();
    std::string live_prefix = std::string(velm_path::zoneinfo_link) + "/";
    if (r.localtime && has_prefix(*r.localtime, live_prefix.c_str()))
        r.localtime_zone = r.localtime->substr(live_prefix.size());
    velm_caught_messages quiet; // the messages of building them are the boot's to write
    velm_calls_in_use simulated(tree);
    try {
        std::string live = current_dataset_path();
        r.zoneinfo_understood = true;
        r.live = facts_at(live);
    } catch (...) {
        // No zoneinfo link that the boot tool understands.
    }
    try {
        std::string latest = latest_dataset_path();
        if (!latest.empty())
            r.latest = facts_at(latest);
    } catch (...) {
        // A tz_latest that is no link.
    }
    if (!r.system_missing)
        r.system = facts_at("");
}

// What the next boot made of the datasets: compatible, older, newer.
static void
read_judgement(const velm_run& next, velm_report& r)
{
    if (r.live.present && next.current.present && next.current.root == r.live.root)
        r.live.compatible = next.current.compatible, r.live.older = next.current.older;
    if (r.latest.present && next.latest.present)
        r.latest.compatible = next.latest.compatible, r.latest.newer = next.latest.newer,
        r.latest.older = next.latest.older;
}

// What of the datasets and the record could not be read, by the report or
// by the simulated boot: a schema or version shown then would be wrong.
static void
note_unread(const std::map<std::string, int>& unread, velm_report& r)
{
    auto below = [&unread](const std::string& top) {
        for (const auto& [path, error] : unread) {
            if (error != EFBIG && (path == top || has_prefix(path, (top + "/").c_str())))
                return true;
        }
        return false;
    };
    r.system.unreadable = below(velm_path::system_zoneinfo) || below(velm_path::system_icu);
    for (velm_dataset_facts* update : {&r.live, &r.latest})
        update->unreadable = !update->root.empty() && below(update->root);
    if (r.live.root.empty())
        r.live.unreadable = r.system.unreadable;
    r.record_unreadable = below(velm_path::record);
}

// The whole report of the tree as the simulation stands, but for the
// commands' check; the simulation is left as it was found.
static velm_report
survey(velm_simulation& tree, const std::string& root)
{
    velm_report r;
    r.root = root;
    velm_simulation::changes now = tree.checkpoint();
    tree.forget_unread();
    read_state(tree, r);
    r.now = now;
    r.next_boot = simulate_boot(tree);
    read_judgement(r.next_boot, r);
    r.next = tree.checkpoint();
    if (r.next_boot.exit_status == 0)
        r.after_next = simulate_boot(tree);
    note_unread(tree.unread(), r);
    find_problems(tree, r);
    tree.rewind(now);
    r.health = "healthy";
    for (const velm_finding& finding : r.findings) {
        if (finding.severity == "error")
            r.health = "broken";
        else if (finding.severity == "warning" && r.health == "healthy")
            r.health = "degraded";
    }
    return r;
}

static bool
same(const velm_finding& a, const velm_finding& b)
{
    return a.id == b.id && a.subject == b.subject;
}

// The device after commands and one boot, as the report of it would say.
// The device after commands and one boot, as the report of it would say;
// none when a command fails, which stops a script run with sh -e.
static std::optional<velm_report>
repaired(velm_simulation& tree, const velm_commands& commands)
{
    for (const velm_command& command : commands) {
        if (!apply(tree, command))
            return std::nullopt;
    }
    simulate_boot(tree);
    return survey(tree, "");
}

// Whether the report after a repair has none of the findings it was to
// clear, and no error that was not there before.
static bool
cleared(const velm_report& before, const std::vector<const velm_finding*>& targets,
        const std::optional<velm_report>& after)
{
    if (!after)
        return false;
    for (const velm_finding& found : after->findings) {
        for (const velm_finding* target : targets) {
            if (same(found, *target))
                return false;
        }
        bool known = false;
        for (const velm_finding& old : before.findings)
            known = known || same(found, old);
        if (found.severity == "error" && !known)
            return false;
    }
    return true;
}

// Each finding's commands are checked before they are shown: applied to the
// simulation, followed by a simulated boot, they must clear the finding and
// break nothing. Then all of them together, in the report's order.
static void
check_repairs(velm_simulation& tree, velm_report& r)
{
    velm_simulation::changes now = tree.checkpoint();
    velm_commands all;
    std::vector<const velm_finding*> targets;
    for (velm_finding& finding : r.findings) {
        // A finding that follows from one before it is cleared by that
        // one's repair, perhaps with its own; or by all of theirs.
        std::vector<velm_commands> tries = finding.tries, earlier;
        for (const velm_finding* target : targets)
            earlier.push_back(*target->commands);
        if (targets.size() > 1)
            earlier.push_back(all);
        for (const velm_commands& first : earlier) {
            for (const velm_commands& own : finding.tries) {
                tries.push_back(first);
                tries.back().insert(tries.back().end(), own.begin(), own.end());
            }
        }
        for (const velm_commands& commands : tries) {
            bool works = cleared(r, {&finding}, repaired(tree, commands));
            tree.rewind(now);
            if (works) {
                finding.commands = commands, finding.verified = true;
                break;
            }
        }
        // None that works, and nothing to supply: a fault of this program,
        // shown as such.
        if (!finding.commands && finding.manual.empty() && !finding.tries.empty())
            finding.commands = finding.tries.front();
        if (finding.commands)
            finding.manual.clear();
        if (!finding.commands)
            continue;
        all.insert(all.end(), finding.commands->begin(), finding.commands->end());
        targets.push_back(&finding);
    }
    std::optional<velm_report> after = repaired(tree, all);
    tree.rewind(now);
    bool together = cleared(r, targets, after);
    for (velm_finding& finding : r.findings)
        finding.verified = finding.verified && together;
    r.repaired_health = after ? after->health : "unknown";
    for (const velm_finding& finding : after ? after->findings : r.findings)
        r.repaired_findings.push_back(finding.id);
}

velm_report
make_report(velm_simulation& tree, const velm_device& device)
{
    velm_report r = survey(tree, device.root);
    check_repairs(tree, r);
    // cppcheck-suppress constVariable ; its commands are rewritten
    for (velm_finding& finding : r.findings) {
        if (!finding.commands)
            continue;
        for (velm_command& c : *finding.commands) {
            if (c.verb != velm_command::symlink_to && c.verb != velm_command::write_word)
                c.first = device.real(c.first);
            if (!c.second.empty())
                c.second = device.real(c.second);
        }
    }
    return r;
}
