// SPDX-License-Identifier: Apache-2.0
// Repairs as a search for the best state the device can reach: each
// finding's candidate repairs are run on the simulation, after the repairs
// already chosen, and followed by one boot; of those that clear it and
// bring no new error, the one whose outcome is best is shown. So the
// commands of one report compose: run in order, they do what each was
// shown to do.
#include "status/report.h"

#include "support/version.h"

#include <map>

namespace {

bool
same(const velm_finding& a, const velm_finding& b)
{
    return a.id == b.id && a.subject == b.subject;
}

// The device after commands and one boot, as the report of it would say;
// none when a command fails, which stops a script run with sh -e.
std::optional<velm_report>
repaired(velm_simulation& tree, const velm_commands& commands)
{
    velm_simulation::changes now = tree.checkpoint();
    std::optional<velm_report> after;
    bool applied = true;
    for (const velm_command& command : commands)
        applied = applied && apply(tree, command);
    if (applied) {
        simulate_boot(tree);
        after = survey(tree, "");
    }
    tree.rewind(now);
    return after;
}

// Whether the report after a repair has none of the findings it was to
// clear, and no error that was not there before.
bool
cleared(const velm_report& before, const std::vector<const velm_finding*>& targets,
        const velm_report& after)
{
    for (const velm_finding& found : after.findings) {
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

// How good a device is after a repair and one boot, in the order the
// manual states: no error; the device's zone kept; the newest data, that
// the boot after keeps too; nothing left to repair; the fewest commands;
// and the fewest updates removed, which a better outcome could have used.
struct velm_outcome {
    int errors = 0;
    bool zone_lost = false;
    velm_version data;
    int left = 0;
    size_t commands = 0;
    int removals = 0;
};

velm_outcome
outcome_of(const velm_report& before, const velm_report& after, const velm_commands& plan)
{
    velm_outcome o;
    for (const velm_finding& found : after.findings) {
        o.errors += found.severity == "error";
        o.left += found.severity != "note" || !found.tries.empty();
    }
    // The zone the boot's localtime link keeps, which /etc/localtime leads
    // through, once repaired.
    o.zone_lost = !before.zone.empty() && after.localtime_zone != before.zone;
    if (after.live.version_understood && after.next_boot.action == "keep")
        velm_version_parse(o.data, after.live.version);
    o.commands = plan.size();
    for (const velm_command& command : plan)
        o.removals +=
            command.verb == velm_command::remove_tree || command.verb == velm_command::prune;
    return o;
}

bool
better(const velm_outcome& a, const velm_outcome& b)
{
    if (a.errors != b.errors)
        return a.errors < b.errors;
    if (a.zone_lost != b.zone_lost)
        return !a.zone_lost;
    if (a.data > b.data || b.data > a.data)
        return a.data > b.data;
    if (a.left != b.left)
        return a.left < b.left;
    if (a.commands != b.commands)
        return a.commands < b.commands;
    return a.removals < b.removals;
}

} // namespace

// The outcomes already simulated, by plan: findings after one that needs
// nothing try the very plans it tried.
struct velm_outcomes {
    velm_simulation& tree;
    std::map<std::string, std::optional<velm_report>> known;

    const std::optional<velm_report>& of(const velm_commands& plan)
    {
        std::string key;
        for (const velm_command& command : plan)
            key += shell_text(command, "") + "\n";
        auto found = known.find(key);
        if (found == known.end())
            found = known.emplace(key, repaired(tree, plan)).first;
        return found->second;
    }
};

void
check_repairs(velm_simulation& tree, velm_report& r)
{
    velm_outcomes outcomes{tree, {}};
    velm_commands all;
    std::vector<const velm_finding*> targets;
    for (velm_finding& finding : r.findings) {
        targets.push_back(&finding);
        std::optional<velm_outcome> best;
        // Whatever it is, the commands above may have cleared it.
        std::vector<velm_commands> tries = finding.tries;
        if (!all.empty() && !finding.tries.empty())
            tries.insert(tries.begin(), velm_commands());
        for (const velm_commands& own : tries) {
            velm_commands plan = all;
            plan.insert(plan.end(), own.begin(), own.end());
            const std::optional<velm_report>& after = outcomes.of(plan);
            if (!after || !cleared(r, targets, *after))
                continue;
            velm_outcome o = outcome_of(r, *after, plan);
            if (!best || better(o, *best))
                best = o, finding.commands = own;
        }
        finding.verified = best.has_value();
        // Nothing more to run: by the next boot alone, or by the commands
        // of the findings above too.
        if (best && finding.commands->empty() && !all.empty()) {
            const std::optional<velm_report>& alone = outcomes.of({});
            finding.by_earlier = !alone || !cleared(r, {&finding}, *alone);
        }
        // None that works: what it needs is what a finding above needs, when
        // nothing is to run; else a fault of this program, shown as such.
        if (!finding.commands && finding.manual.empty() && !finding.tries.empty()) {
            if (finding.tries.front().empty())
                finding.manual = "the repairs of the findings above";
            else
                finding.commands = finding.tries.front();
        }
        if (finding.commands)
            finding.manual.clear();
        if (finding.verified)
            all.insert(all.end(), finding.commands->begin(), finding.commands->end());
        else
            targets.pop_back();
    }
    const std::optional<velm_report>& after = outcomes.of(all);
    bool together = after && cleared(r, targets, *after);
    for (velm_finding& finding : r.findings)
        finding.verified = finding.verified && together;
    r.repaired_health = after ? after->health : "unknown";
    for (const velm_finding& finding : after ? after->findings : r.findings)
        r.repaired_findings.push_back(finding.id);
}
