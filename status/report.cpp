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

velm_report
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
