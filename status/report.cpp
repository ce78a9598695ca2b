// SPDX-License-Identifier: Apache-2.0
#include "status/report.h"

#include "dataset/dataset.h"
#include "dataset/icu.h"
#include "driver/startup.h"
#include "support/prefix.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <functional>
#include <memory>
#include <set>
#include <sys/mman.h>
#include <unistd.h>

static const char live_zoneinfo[] = "/var/db/timezone/zoneinfo/";
static const char updates[] = "/var/db/timezone/tz/";
static const char system_zoneinfo[] = "/usr/share/zoneinfo.default";
static const char record_path[] = "/var/db/timezone/TZVersionDiffRecord";
static const char remove_zoneinfo[] =
    "remove /var/db/timezone/zoneinfo; the next boot then links the system data and adopts "
    "the update tz_latest names, relinking zoneinfo and icutz together";

// Runs f with standard error caught and the program named as the boot
// tool: the product code warns as it does at boot, and those are the
// messages a boot would write.
static std::vector<std::string>
as_tzlinks(const std::function<void()>& f)
{
    int saved = dup(2), caught = memfd_create("messages", MFD_CLOEXEC);
    char* name = program_invocation_short_name;
    program_invocation_short_name = const_cast<char*>("tzlinks");
    dup2(caught, 2);
    f();
    dup2(saved, 2);
    close(saved);
    program_invocation_short_name = name;
    std::string text(static_cast<size_t>(lseek(caught, 0, SEEK_END)), '\0');
    text.resize(
        static_cast<size_t>(std::max(pread(caught, text.data(), text.size(), 0), ssize_t(0))));
    close(caught);
    std::vector<std::string> lines;
    for (size_t at = 0, end; (end = text.find('\n', at)) != std::string::npos; at = end + 1)
        lines.push_back(text.substr(at, end - at));
    return lines;
}

static velm_text
link_at(const velm_simulation& tree, const std::string& path)
{
    velm_entry entry = tree.look(path);
    return entry.kind == velm_entry::link ? velm_text(entry.text) : std::nullopt;
}

static velm_text
file_at(const velm_simulation& tree, const std::string& path, bool follow = false)
{
    if (tree.look(path, follow).kind != velm_entry::file)
        return std::nullopt;
    std::string text;
    int fd = tree.open_for_reading(path.c_str(), 0);
    char buffer[4096];
    for (ssize_t n; (n = read(fd, buffer, sizeof buffer)) > 0;) // none from no file
        text.append(buffer, static_cast<size_t>(n));
    (void)close(fd);
    return text;
}

static std::unique_ptr<velm_dataset>
dataset_at(const std::string& root)
{
    try {
        return std::make_unique<velm_dataset>(root);
    } catch (...) {
        return nullptr; // a bad path, or a version number beyond 32 bits
    }
}

static velm_dataset_facts
facts_of(const velm_dataset* dataset, const std::string& root)
{
    velm_dataset_facts facts;
    if (dataset == nullptr)
        return facts;
    facts.present = true;
    facts.root = root;
    facts.version = dataset->get_version_string();
    facts.version_understood = dataset->get_version().year >= 0;
    facts.icu_schema = dynamic_cast<const velm_icu&>(*dataset->get_components().at(1)).get_schema();
    return facts;
}

// The links, the record and the three datasets as they stand, read as the
// boot tool reads them.
static void
read_state(const velm_simulation& tree, velm_report& r)
{
    r.zoneinfo = link_at(tree, "/var/db/timezone/zoneinfo");
    r.icutz = link_at(tree, "/var/db/timezone/icutz");
    r.localtime = link_at(tree, "/var/db/timezone/localtime");
    r.tz_latest = link_at(tree, "/var/db/timezone/tz_latest");
    r.record = file_at(tree, record_path);
    if (r.localtime && has_prefix(*r.localtime, live_zoneinfo))
        r.localtime_zone = r.localtime->substr(sizeof live_zoneinfo - 1);
    as_tzlinks([&] {
        auto system = dataset_at("");
        std::unique_ptr<velm_dataset> live, latest;
        try {
            r.live.root = current_dataset_path();
            r.zoneinfo_understood = true;
            live = dataset_at(r.live.root);
        } catch (...) {
            // No zoneinfo link that the tool understands.
        }
        try {
            r.latest.root = latest_dataset_path();
            latest = r.latest.root.empty() ? nullptr : dataset_at(r.latest.root);
        } catch (...) {
            // A tz_latest that is no link.
        }
        r.system = facts_of(system.get(), "");
        r.live = facts_of(live.get(), r.live.root);
        r.latest = facts_of(latest.get(), r.latest.root);
        if (!system)
            return;
        const velm_dataset& current = live ? *live : *system;
        r.live.compatible = live && live->compatible(*system);
        r.live.older = live && *system > *live;
        r.latest.compatible = latest && latest->compatible(*system);
        r.latest.newer = latest && *latest > current;
    });
}

// Runs the boot tool's own start-up sequence on the simulation and notes
// what it leaves.
static void
simulate_next_boot(const velm_simulation& tree, velm_report& r)
{
    r.next_boot.messages = as_tzlinks([&] {
        errno = 0; // as in a process just started
        r.next_boot.exit_status = run_startup_sequence();
    });
    r.next_boot.zoneinfo = link_at(tree, "/var/db/timezone/zoneinfo");
    r.next_boot.icutz = link_at(tree, "/var/db/timezone/icutz");
    r.next_boot.localtime = link_at(tree, "/var/db/timezone/localtime");
    if (tree.written(record_path))
        r.next_boot.record = tree.look(record_path).text;
    const auto& next = r.next_boot.zoneinfo;
    r.next_boot.action = r.next_boot.exit_status != 0 ? "fail"
                         : next == r.zoneinfo         ? "keep"
                         : next == system_zoneinfo    ? "reset"
                                                      : "adopt";
}

static void
add(velm_report& r, const char* severity, const std::string& id, const std::string& message,
    const std::string& repair)
{
    r.findings.push_back({id, severity, message, repair});
}

static std::string
quoted(const velm_text& text)
{
    return text ? "\"" + *text + "\"" : "nothing";
}

// What stands in the tree before the next boot changes anything.
struct velm_now {
    bool system_data, zoneinfo_usable, localtime_usable, latest_entry, record_other;
    std::set<std::string> legacy; // of /var/db/icutz and /var/db/icu
};

static velm_now
look_now(const velm_simulation& tree)
{
    auto kind = [&tree](const std::string& path, bool follow) {
        return tree.look(path, follow).kind;
    };
    velm_entry record = tree.look(record_path);
    velm_now now = {
        kind(system_zoneinfo, true) == velm_entry::directory,
        kind("/var/db/timezone/zoneinfo", true) == velm_entry::directory,
        // A zone file begins with the magic of the compiled format.
        file_at(tree, "/var/db/timezone/localtime", true).value_or("").compare(0, 4, "TZif") == 0,
        kind("/var/db/timezone/tz_latest", false) != velm_entry::absent,
        record.kind != velm_entry::absent && (record.kind != velm_entry::file || record.shared),
        {}};
    for (const char* legacy : {"/var/db/icutz", "/var/db/icu"}) {
        if (tree.look(legacy).kind != velm_entry::absent)
            now.legacy.insert(legacy);
    }
    return now;
}

// Entries that cannot be looked at: searching a directory is refused, a
// link loops, a name is too long. What lies behind them counts as missing.
// One finding for each cause: a link that loops also stops what leads
// through it.
static void
find_unreadable(const velm_simulation& tree, velm_report& r)
{
    std::set<int> seen = {0, ENOENT, ENOTDIR};
    for (const char* path :
         {system_zoneinfo, "/usr/share/icu", "/var/db/timezone/zoneinfo", "/var/db/timezone/icutz",
          "/var/db/timezone/localtime", "/var/db/timezone/tz_latest", record_path}) {
        int error = tree.look(path, true).error;
        if (seen.insert(error).second)
            add(r, "warning", "unreadable",
                std::string(path) + " cannot be followed: " + strerror(error) + ".",
                "make it readable, or remove it");
    }
    // An update's ICU directory is read, not only looked up.
    for (const std::string& root : {r.live.root, r.latest.root}) {
        if (root.empty())
            continue;
        int fd = tree.open_for_reading((root + "/icutz").c_str(), O_DIRECTORY);
        if (fd >= 0)
            (void)close(fd);
        else if (seen.insert(errno).second)
            add(r, "warning", "unreadable",
                root + "/icutz cannot be read: " + strerror(errno) + ".",
                "make it readable, or remove it");
    }
}

// The datasets: the system's, the one in use and the latest update.
static void
find_data_problems(const velm_now& now, velm_report& r)
{
    if (!now.system_data)
        add(r, "error", "no-system-data",
            std::string(system_zoneinfo) +
                " is no directory: there is no system tz database to fall back on.",
            "install the system's time-zone data");
    else if (!r.system.present)
        add(r, "error", "system-version",
            std::string("The first word of ") + system_zoneinfo +
                "/+VERSION holds a number too large for a "
                "version: not even the system data can be linked.",
            "write the version, such as 2023c, as the first word of that file");
    else if (!r.system.version_understood)
        add(r, "warning", "system-version",
            "The system data's version is \"" + r.system.version +
                "\", which is not a version: every boot warns about it, the system data orders "
                "below every update, and the data in use is never found older than it.",
            std::string("write the version, such as 2023c, as the first word of ") +
                system_zoneinfo + "/+VERSION");
    if (!now.zoneinfo_usable)
        add(r, "error", "zoneinfo-unusable",
            "/var/db/timezone/zoneinfo names " + quoted(r.zoneinfo) +
                ", which leads to no tz database: readers have none until a boot links one.",
            "run tzlinks (or boot): it links the data shown under next boot");
    else if (!r.zoneinfo_understood)
        add(r, "warning", "zoneinfo-not-understood",
            "/var/db/timezone/zoneinfo names " + quoted(r.zoneinfo) +
                ", which is neither an update below " + updates + " nor " + system_zoneinfo +
                ": the next boot resets to the system data.",
            "none needed: the next boot resets it");
    else if (r.system.present && !r.live.present)
        add(r, "warning", "live-rejected",
            "The data in use has a version number too large: the next boot resets to the "
            "system data.",
            "none needed: the next boot resets it");
    else if (r.system.present && (!r.live.compatible || r.live.older))
        add(r, "warning", "live-rejected",
            "The data in use, " + r.live.version + ", is " +
                (r.live.compatible
                     ? "older than the system data, " + r.system.version
                     : "incompatible with the system data (ICU schema \"" + r.live.icu_schema +
                           "\", the system's \"" + r.system.icu_schema + "\")") +
                ": the next boot resets to the system data.",
            "none needed: the next boot resets it");
    if (now.latest_entry && !r.latest.present)
        add(r, "warning", "latest-not-understood",
            "tz_latest names " + quoted(r.tz_latest) + ", which is not an update below " + updates +
                (r.tz_latest && !has_prefix(*r.tz_latest, "/") ? " (a relative target is never "
                                                                 "understood)"
                                                               : "") +
                ": every boot resets to the system data.",
            std::string("make tz_latest a link to ") + updates + "<version>, by its absolute path");
    else if (r.latest.present && !(r.latest.compatible && r.latest.newer))
        add(r, "note", "latest-refused",
            r.latest.root == r.live.root && r.live.present
                ? "tz_latest names the data in use; every boot says so."
                : "The next boot does not adopt " + r.latest.version + ": it is " +
                      (r.latest.compatible ? "not newer than the data in use"
                                           : "incompatible with the system data") +
                      ".",
            "none needed");
}

// The links as the next boot leaves them: a state that no later boot
// changes shows here, where the boot tool never looks again.
static void
find_link_problems(const velm_simulation& tree, const velm_now& now, velm_report& r)
{
    const auto& next = r.next_boot;
    std::string update = next.zoneinfo && has_prefix(*next.zoneinfo, updates)
                             ? next.zoneinfo->substr(0, next.zoneinfo->rfind('/'))
                             : "";
    bool icutz = tree.look("/var/db/timezone/icutz").kind != velm_entry::absent;
    if (next.exit_status != 0)
        add(r, "error", "next-boot-fails",
            "The next boot cannot even link the system data (exit status " +
                std::to_string(next.exit_status) + ").",
            "see the messages of the next boot");
    else if (tree.look("/var/db/timezone/zoneinfo", true).kind != velm_entry::directory)
        add(r, "error", "next-boot-unusable",
            "The next boot links zoneinfo to " + quoted(next.zoneinfo) +
                ", where there is no tz database: every reader would fall back to UTC.",
            "unpack the update whole, its zoneinfo directory included");
    else if (!update.empty() && next.icutz != update + "/icutz")
        add(r, "warning", icutz ? "icutz-stale" : "icutz-missing",
            "icutz names " + quoted(next.icutz) + ", not the ICU data of the update in use, " +
                update +
                ": ICU readers use other data than the tz database, and no boot "
                "changes that.",
            remove_zoneinfo);
    else if (update.empty() && icutz)
        add(r, "warning", "icutz-with-system",
            "icutz is there while the system data is in use: ICU readers use data that is "
            "not the system's, and no boot changes that.",
            remove_zoneinfo);
    bool next_usable =
        file_at(tree, "/var/db/timezone/localtime", true).value_or("").compare(0, 4, "TZif") == 0;
    if (!now.localtime_usable || !r.localtime)
        add(r, "error", "localtime-unusable",
            "localtime names " + quoted(r.localtime) + ", which is no link to a zone file; " +
                "the next boot leaves " + quoted(next.localtime) + ".",
            next_usable ? "run tzlinks (or boot): it sets localtime as shown under next boot"
                        : "point /var/db/timezone/localtime at /var/db/timezone/zoneinfo/<zone>");
    else if (next.localtime != r.localtime &&
             next.localtime == "/var/db/timezone/zoneinfo/America/Los_Angeles")
        add(r, "warning",
            has_prefix(*r.localtime, "/usr/share/zoneinfo.default/") ? "localtime-legacy-default"
                                                                     : "localtime-reset",
            "localtime names " + quoted(r.localtime) +
                ", which the next boot does not accept: it sets the zone to America/Los_Angeles.",
            "point /var/db/timezone/localtime at /var/db/timezone/zoneinfo/<zone>");
    if (now.record_other)
        add(r, "warning", "record-not-a-file",
            std::string(record_path) +
                " is no regular file of its own: no adoption is ever recorded there.",
            std::string("remove ") + record_path);
    // An adoption writes the record last: cut short, or failed, it leaves
    // the record of an earlier one. (No record at all is what an image
    // made with an update in place looks like.)
    std::string adopted = "_" + r.live.version;
    if (next.action == "keep" && !update.empty() && r.live.present && r.record &&
        (r.record->size() < adopted.size() ||
         r.record->compare(r.record->size() - adopted.size(), std::string::npos, adopted) != 0))
        add(r, "note", "record-stale",
            "The record reads \"" + *r.record + "\", which does not name the adoption of " +
                r.live.version + ", the update in use.",
            "none needed: the next adoption writes it anew");
    for (const char* legacy : {"/var/db/icutz", "/var/db/icu"}) {
        if (now.legacy.count(legacy) != 0)
            add(r, "note", "legacy-entries",
                std::string(legacy) + (tree.look(legacy).kind != velm_entry::absent
                                           ? " is still there, and the next boot leaves it."
                                           : " is still there; the next boot clears it away."),
                "none needed");
    }
}

// The boot after the next one, on what the next one leaves. An update
// older than the system data is adopted when the data in use is older
// still, and the following boot sets it aside again.
static void
find_unsettled(const velm_simulation& tree, velm_report& r)
{
    if (r.next_boot.exit_status != 0)
        return;
    as_tzlinks([] {
        errno = 0;
        (void)run_startup_sequence();
    });
    velm_text zoneinfo = link_at(tree, "/var/db/timezone/zoneinfo");
    if (zoneinfo != r.next_boot.zoneinfo)
        add(r, "warning", "unsettled",
            "The boot after the next one links zoneinfo to " + quoted(zoneinfo) +
                " in turn: the next boot adopts data that the one after sets aside.",
            "point tz_latest at an update that is not older than the system data");
}

velm_report
make_report(velm_simulation& tree)
{
    velm_report r;
    const velm_system_calls& real = system_calls();
    use_system_calls(tree);
    tree.reset();
    read_state(tree, r);
    velm_now now = look_now(tree);
    find_unreadable(tree, r);
    find_data_problems(now, r);
    simulate_next_boot(tree, r);
    find_link_problems(tree, now, r);
    find_unsettled(tree, r);
    tree.reset();
    use_system_calls(real);
    r.health = "healthy";
    for (const velm_finding& finding : r.findings) {
        if (finding.severity == "error")
            r.health = "broken";
        else if (finding.severity == "warning" && r.health == "healthy")
            r.health = "degraded";
    }
    return r;
}
