// SPDX-License-Identifier: Apache-2.0
// What is wrong with a device tree, each with the repairs a person can
// make. What a boot does is always read off its simulated run (the links it
// leaves, the lines it writes); the facts of the tree only say why.
#include "status/report.h"

#include "dataset/dataset.h"
#include "device/data.h"
#include "support/paths.h"
#include "support/prefix.h"
#include "support/version.h"

#include <algorithm>
#include <cstring>
#include <set>
#include <sys/stat.h>
#include <unistd.h>

namespace {

const char spaces[] = " \t\n\v\f\r";

velm_command
ln(const std::string& target, const std::string& path)
{
    return {velm_command::symlink_to, target, path};
}

// Removes whatever stands at path: rm -f, or rm -rf for a directory. The
// tree decides which, as it stands before any repair.
velm_simulation* before_repair = nullptr;

velm_command
rm(const std::string& path)
{
    bool tree = before_repair->look(path).kind == velm_entry::directory;
    return {tree ? velm_command::remove_tree : velm_command::remove_entry, path, ""};
}

// What makes path a link to target: ln -sfn replaces anything but a
// directory, which has to go first.
velm_commands
relink(const std::string& target, const std::string& path)
{
    velm_commands commands;
    if (before_repair->look(path).kind == velm_entry::directory)
        commands.push_back(rm(path));
    commands.push_back(ln(target, path));
    return commands;
}

// What clears path for a new entry: nothing when nothing stands there.
velm_commands
clear(const std::string& path)
{
    return before_repair->look(path).kind == velm_entry::absent ? velm_commands()
                                                                : velm_commands{rm(path)};
}

std::string
quoted(const velm_text& text)
{
    return text ? "\"" + *text + "\"" : "nothing";
}

// What stands at one of the links, in words: its target, or what it is.
std::string
standing(velm_simulation& tree, const std::string& path)
{
    velm_entry entry = tree.look(path);
    return entry.kind == velm_entry::link        ? "names \"" + entry.text + "\""
           : entry.kind == velm_entry::absent    ? "is missing"
           : entry.kind == velm_entry::directory ? "is a directory, not a link"
                                                 : "is no link";
}

std::string
schema(const std::string& text)
{
    return text.empty() ? "none" : text;
}

std::string
parent_of(const std::string& path)
{
    return path.substr(0, path.rfind('/'));
}

// The update a link names, "/var/db/timezone/tz/NAME", or "".
std::string
update_of(const velm_text& path)
{
    return velm_update_of(path.value_or(""));
}

// What a run leaves, in words.
std::string
what_it_does(const velm_run& run)
{
    if (run.action == "adopt")
        return "adopts " + update_of(run.zoneinfo).substr(sizeof velm_path::updates - 1);
    if (run.action == "fail")
        return "fails";
    return run.zoneinfo == velm_path::system_zoneinfo ? "links the system data"
                                                      : "keeps the data in use";
}

// A report's findings are made while the simulation stands as the tree is
// now, or as the next boot leaves it: each look says which.
struct finder {
    velm_simulation& tree;
    velm_report& r;
    const velm_simulation::changes* at = nullptr; // where the simulation stands

    velm_finding& add(const char* severity, const char* id, const std::string& subject,
                      const std::string& message)
    {
        velm_finding finding;
        finding.severity = severity, finding.id = id, finding.subject = subject;
        finding.message = message;
        r.findings.push_back(finding);
        return r.findings.back();
    }
    // A rewind copies every change: made only when the other state is asked.
    velm_simulation& now() { return state(r.now); }
    velm_simulation& next() { return state(r.next); }
    velm_simulation& state(const velm_simulation::changes& wanted)
    {
        if (at != &wanted)
            tree.rewind(wanted), at = &wanted;
        return tree;
    }
};

velm_entry::kind_t
kind(velm_simulation& tree, const std::string& path, bool follow = false)
{
    return tree.look(path, follow).kind;
}

// The release a tz database's own source names on its first line, as
// "# version 2025b"; for a database whose +VERSION is missing or wrong.
std::string
release_in(velm_simulation& tree, const std::string& directory)
{
    std::string text = tree.read(directory + "/tzdata.zi", 64).value_or("");
    static const char mark[] = "# version ";
    if (!has_prefix(text, mark))
        return "";
    std::string word = text.substr(sizeof mark - 1,
                                   text.find_first_of(spaces, sizeof mark - 1) - (sizeof mark - 1));
    return velm_version_match_text(word).size == 5 ? word : "";
}

bool
tz_database(velm_simulation& tree, const std::string& directory)
{
    for (const char* name : {"/tzdata.zi", "/zone1970.tab", "/zone.tab", "/+VERSION"}) {
        if (kind(tree, directory + name, true) == velm_entry::file)
            return true;
    }
    return false;
}

// Where readers of the device find its data, or the tool does its work.
void
find_places(finder& f)
{
    velm_simulation& tree = f.now();
    if (!tree.as_boot())
        f.add("note", "unverified", "",
              "tzlinks-status runs as user " + std::to_string(geteuid()) +
                  ", not as root as the boot does: the kernel was not asked whether the boot may "
                  "change the tree, and what only root may read is taken as missing.");
    velm_entry directory = tree.look(velm_path::link_directory, true);
    if (directory.kind != velm_entry::directory) {
        velm_finding& no =
            f.add("error", "no-timezone-directory", velm_path::link_directory,
                  std::string(velm_path::link_directory) +
                      (directory.kind == velm_entry::absent ? " is missing" : " is no directory") +
                      ": the boot cannot link any data, not even the system's.");
        velm_commands make = clear(velm_path::link_directory);
        make.push_back({velm_command::make_dirs, velm_path::updates, ""});
        no.tries = {make};
    }
    if (kind(tree, velm_path::system_zoneinfo, true) == velm_entry::directory)
        return;
    bool instead = kind(tree, velm_path::legacy_zoneinfo) == velm_entry::directory &&
                   tz_database(tree, velm_path::legacy_zoneinfo);
    std::string release = release_in(tree, velm_path::legacy_zoneinfo);
    velm_finding& no =
        f.add("error", "no-system-data", velm_path::system_zoneinfo,
              std::string(velm_path::system_zoneinfo) +
                  " is no directory: there is no system tz database to fall back on" +
                  (instead ? std::string("; ") + velm_path::legacy_zoneinfo + " holds one" +
                                 (release.empty() ? "" : " (release " + release + ")")
                           : std::string(", nor in ") + velm_path::legacy_zoneinfo) +
                  ".");
    no.manual = std::string("a compiled tz database at ") + velm_path::system_zoneinfo +
                ", with its release, such as 2025b, as the first word of its +VERSION";
    std::string version = std::string(velm_path::system_zoneinfo) + "/+VERSION";
    if (instead) {
        velm_commands copy = clear(velm_path::system_zoneinfo);
        copy.push_back(
            {velm_command::copy_tree, velm_path::legacy_zoneinfo, velm_path::system_zoneinfo});
        if (!release.empty() &&
            velm_first_word(tree, velm_path::legacy_zoneinfo + std::string("/+VERSION")).empty())
            copy.push_back({velm_command::write_word, release, version});
        no.tries = {copy};
    }
}

// What the report and the boot could not read.
void
find_unread(finder& f, const std::map<std::string, int>& unread)
{
    for (const auto& [path, error] : unread) {
        if (error == EFBIG) {
            f.add("note", "read-in-part", path,
                  path + " is longer than this report reads: only its start was read.");
            continue;
        }
        // Only a loop of links or an over-long name stops root: what to do
        // about the link that leads there, the other findings say.
        bool boot_reads = !f.tree.as_boot() && (error == EACCES || error == EPERM);
        bool note = boot_reads || error == ELOOP || error == ENAMETOOLONG;
        velm_finding& found =
            f.add(note ? "note" : "warning", "unreadable", path,
                  path + " cannot be read: " + strerror(error) +
                      (boot_reads ? " (by this user; the boot, as root, may read it)" : "") +
                      ": what lies behind it counts as missing in this report.");
        if (!note)
            found.manual = "read access for root to " + path + ", or its removal";
    }
}

void
find_system_version(finder& f)
{
    velm_simulation& tree = f.now();
    if (kind(tree, velm_path::system_zoneinfo, true) != velm_entry::directory ||
        (f.r.system.present && f.r.system.version_understood) || f.r.system.unreadable)
        return;
    std::string version = std::string(velm_path::system_zoneinfo) + "/+VERSION";
    velm_finding& found =
        !f.r.system.present
            ? f.add("error", "system-version", version,
                    "The first word of " + version +
                        " holds a number too large for a version: not even the system data can "
                        "be linked.")
            : f.add("warning", "system-version", version,
                    (velm_first_word(tree, version).empty() ? version + " holds no version, so t"
                                                            : std::string("T")) +
                        "he system data's version is \"" + f.r.system.version +
                        "\", which is not a version: every boot warns about it, the system data "
                        "orders below every update, and the data in use is never found older "
                        "than it.");
    found.manual = "the release of the tz database in " + std::string(velm_path::system_zoneinfo) +
                   ", such as 2025b, as the first word of its +VERSION";
    std::string release = release_in(tree, velm_path::system_zoneinfo);
    if (release.empty())
        return;
    velm_commands write =
        tree.look(version).kind == velm_entry::file ? velm_commands() : clear(version);
    write.push_back({velm_command::write_word, release, version});
    found.tries = {write};
}

// Repairs that end on other data the device holds, the newest first:
// tz_latest pointed at an update named by a version that holds a tz
// database (or removed, for the system data), and zoneinfo removed, so that
// the boot links the system data and adopts what tz_latest names.
std::vector<velm_commands>
data_moves(finder& f)
{
    velm_simulation& tree = f.now();
    std::vector<std::pair<velm_version, std::string>> found;
    std::string updates = tree.where(velm_path::updates, true);
    for (const auto& [name, entry_kind] : tree.names(updates).value_or(velm_names())) {
        velm_version version;
        std::string root = velm_path::updates + name;
        if (entry_kind != velm_entry::directory || velm_version_match_text(name).size != 5 ||
            kind(tree, root + "/zoneinfo", true) != velm_entry::directory)
            continue;
        try {
            velm_version_parse(version, name);
            found.emplace_back(version, root);
        } catch (...) {
            // A number beyond 32 bits: no dataset the boot can build.
        }
    }
    std::sort(found.begin(), found.end(),
              [](const auto& a, const auto& b) { return a.first > b.first; });
    found.resize(std::min(found.size(), size_t(4)));
    std::vector<velm_commands> bases;
    for (const auto& [version, root] : found) {
        bases.push_back(clear(velm_path::zoneinfo_link));
        bases.back().insert(bases.back().begin(), ln(root, velm_path::latest_link));
    }
    bases.push_back(clear(velm_path::latest_link));
    for (const velm_command& command : clear(velm_path::zoneinfo_link))
        bases.back().push_back(command);
    // Each with the device's zone kept, and with what it leaves unnamed
    // pruned, so that one round ends it.
    std::string live = std::string(velm_path::zoneinfo_link) + "/" + f.r.zone;
    bool zone = !f.r.zone.empty() && (f.r.localtime_zone != f.r.zone ||
                                      !velm_zone_file(tree, velm_path::localtime_link));
    std::vector<velm_commands> moves;
    for (const velm_commands& base : bases) {
        for (int variant = 0; variant < (zone ? 4 : 2); ++variant) {
            moves.push_back(base);
            if (variant >= 2)
                for (const velm_command& command : relink(live, velm_path::localtime_link))
                    moves.back().push_back(command);
            // icutz still names the update left, until the boot relinks it.
            if (variant % 2 == 1) {
                for (const velm_command& command : clear(velm_path::icutz_link))
                    moves.back().push_back(command);
                moves.back().push_back({velm_command::prune, "", ""});
            }
        }
    }
    return moves;
}

// Tries, each also followed by a prune of what it leaves unnamed (the
// update tz_latest named, once refused), so that one round ends it.
std::vector<velm_commands>
with_prune(std::vector<velm_commands> tries)
{
    for (size_t i = 0, n = tries.size(); i < n; ++i) {
        tries.push_back(tries[i]);
        tries.back().push_back({velm_command::prune, "", ""});
    }
    return tries;
}

// A finding's tries, and then the repairs that end on other data.
std::vector<velm_commands>
with_moves(finder& f, std::vector<velm_commands> tries)
{
    for (velm_commands& move : data_moves(f))
        tries.push_back(move);
    return tries;
}

// The data in use, as the zoneinfo link names it.
void
find_live(finder& f)
{
    const velm_report& r = f.r;
    velm_simulation& tree = f.now();
    std::string consequence = "the next boot " + what_it_does(r.next_boot);
    velm_commands reset = {rm(velm_path::zoneinfo_link)};
    velm_commands system = {rm(velm_path::zoneinfo_link), rm(velm_path::latest_link)};
    if (kind(tree, velm_path::zoneinfo_link, true) != velm_entry::directory) {
        f.add("error", "zoneinfo-unusable", velm_path::zoneinfo_link,
              std::string(velm_path::zoneinfo_link) + " " +
                  standing(tree, velm_path::zoneinfo_link) +
                  ", which leads to no tz database: programs have none; " + consequence + ".")
            .tries = with_moves(f, {{}, reset, system});
    } else if (!r.next_boot.understood) {
        f.add("warning", "zoneinfo-not-understood", velm_path::zoneinfo_link,
              std::string(velm_path::zoneinfo_link) + " " +
                  standing(tree, velm_path::zoneinfo_link) + ", which is neither an update below " +
                  velm_path::updates + " nor " + velm_path::system_zoneinfo + ": " + consequence +
                  ".")
            .tries = with_moves(f, {{}, reset, system});
    }
    if (!r.next_boot.current.present || r.next_boot.kept)
        return;
    std::string why =
        !r.live.present ? "has a version number too large"
        : !r.live.compatible
            ? "has ICU schema " +
                  (r.live.unreadable && r.live.icu_schema.empty() ? std::string("unknown")
                                                                  : schema(r.live.icu_schema)) +
                  ", the system data " + schema(r.system.icu_schema)
        : !r.live.version_understood ? "is named \"" + r.live.version +
                                           "\", which is not a version and counts as older "
                                           "than the system data"
                                     : "is older than the system data, " + r.system.version;
    f.add("warning", "live-rejected", velm_path::zoneinfo_link,
          "The data in use, " + (r.live.present ? r.live.version : r.live.root) + ", " + why +
              ": the next boot sets it aside and " + what_it_does(r.next_boot) + ".")
        .tries = with_moves(f, {{}, {rm(velm_path::latest_link)}});
}

// A tz_latest the boot tool does not understand: why, and what it does.
void
latest_not_understood(finder& f, const velm_entry& entry)
{
    velm_simulation& tree = f.now();
    std::string target = f.r.tz_latest.value_or("");
    std::string why =
        entry.kind != velm_entry::link ? "is no link"
        : !has_prefix(target, "/")
            ? "names \"" + target + "\": a relative target is never understood"
        : !has_prefix(target, velm_path::updates) || velm_update_of(target).empty()
            ? "names \"" + target + "\", which is no update below " + velm_path::updates
            : "names " + target + ", whose version holds a number too large";
    velm_finding& found =
        f.add("warning", "latest-not-understood", velm_path::latest_link,
              std::string(velm_path::latest_link) + " " + why + ": the next boot " +
                  (f.r.next_boot.abandoned ? "gives up its choice and links the system data"
                                           : what_it_does(f.r.next_boot)) +
                  ".");
    // Another spelling of an update's directory (relative, "//", "/./",
    // "/../"): the same update, spelled as the boot reads it.
    std::string meant = velm_update_at(tree, velm_path::latest_link);
    if (entry.kind == velm_entry::link && !meant.empty() &&
        tree.where(meant, true) == tree.where(velm_path::latest_link, true))
        found.tries.push_back({ln(meant, velm_path::latest_link)});
    found.tries = with_moves(f, found.tries);
}

// tz_latest names a directory whose name is no version: the same update
// spelled as the boot reads it, or renamed for the release it holds.
void
latest_not_a_version(finder& f, const velm_commands& respelled)
{
    const velm_report& r = f.r;
    const velm_dataset_facts& latest = r.latest;
    velm_simulation& tree = f.now();
    velm_finding& found =
        f.add("warning", "latest-not-a-version", latest.root,
              "tz_latest names " + latest.version +
                  ", a name that is not a version (such as 2025b.1.0): no boot adopts it.");
    std::string word = velm_first_word(tree, latest.root + "/zoneinfo/+VERSION");
    std::string version = velm_release_version(word.empty() ? "2025b" : word);
    std::string renamed = velm_path::updates + version;
    found.manual = "a version as the name of " + latest.root + ", such as " + version;
    if (!respelled.empty())
        found.tries.push_back(respelled);
    if (velm_version_match_text(word).size == 5 && latest.root != r.live.root &&
        kind(tree, renamed) == velm_entry::absent)
        found.tries.push_back({{velm_command::move_tree, latest.root, renamed},
                               ln(renamed, velm_path::latest_link)});
    found.tries = with_moves(f, found.tries);
}

// An update refused by the next boot, or adopted and set aside by the one
// after: why, in the boot's terms or the tree's.
void
latest_refused(finder& f, const velm_refusal& refusal)
{
    const velm_report& r = f.r;
    const velm_dataset_facts& latest = r.latest;
    velm_simulation& tree = f.now();
    std::string target = r.tz_latest.value_or(""), name = "tz_latest names " + latest.version;
    velm_commands unlink = {rm(velm_path::latest_link)};
    velm_commands to_live = r.live.present && !r.live.root.empty()
                                ? velm_commands{ln(r.live.root, velm_path::latest_link)}
                                : unlink;
    // The update it leads to, spelled as the boot reads it, when that is
    // not how tz_latest spells it (".../tz/./2024a.1.0").
    std::string meant = velm_update_at(tree, velm_path::latest_link);
    velm_commands respelled = {ln(meant, velm_path::latest_link)};
    if (meant.empty() || meant == target ||
        tree.where(meant, true) != tree.where(velm_path::latest_link, true))
        respelled.clear();
    if (target.back() == '/') {
        f.add("warning", "latest-trailing-slash", latest.root,
              "tz_latest names \"" + target + "\", with a trailing slash: its version is then \"" +
                  latest.version + "\", which is not a version, and no boot adopts it.")
            .tries = with_moves(f, {respelled});
    } else if (kind(tree, latest.root, true) != velm_entry::directory) {
        f.add("warning", "latest-missing", latest.root,
              "tz_latest names " + latest.root + ", which does not exist: no boot adopts it.")
            .tries = with_moves(f, with_prune({to_live, unlink}));
    } else if (!latest.version_understood) {
        latest_not_a_version(f, respelled);
    } else {
        velm_finding& found =
            f.add("warning", refusal.id.c_str(), latest.root,
                  name + ", " + refusal.reason +
                      (!r.next_boot.adopted ? ": no boot adopts it."
                                            : ": the next boot adopts it, the data in use being "
                                              "older still, and the boot after sets it aside."));
        std::string want = r.system.icu_schema;
        if (!latest.compatible)
            found.manual = want.empty()
                               ? "the system's ICU schema, such as 44l, as the first word "
                                 "of " +
                                     std::string(velm_path::system_icu) + "/icutzformat.txt"
                               : "ICU data built for schema " + want + ", as " + latest.root +
                                     "/icutz/icutz" + want +
                                     ".dat, a regular file readable by others";
        // Back to the data in use, or on to other data the device holds:
        // every boot then stops saying it.
        found.tries = latest.older ? std::vector<velm_commands>{unlink}
                                   : std::vector<velm_commands>{to_live, unlink};
        found.tries = with_moves(f, with_prune(found.tries));
    }
}

// Why the update tz_latest names is not adopted, or not for good.
void
find_latest(finder& f)
{
    const velm_report& r = f.r;
    velm_entry entry = f.now().look(velm_path::latest_link);
    if (entry.kind == velm_entry::absent)
        return;
    if (!r.latest.present)
        return latest_not_understood(f, entry);
    if (r.live.present && r.latest.root == r.live.root && r.next_boot.action == "keep") {
        f.add("note", "latest-in-use", r.latest.root,
              "tz_latest names the data in use, " + r.latest.version + "; every boot says so.");
        return;
    }
    if (auto refusal = refusal_of(r.next_boot, r.after_next ? &*r.after_next : nullptr))
        latest_refused(f, *refusal);
}

// A few of many names, for a message: "a, b, c and 4 more".
std::string
some_of(const std::vector<std::string>& names)
{
    std::string out;
    for (size_t i = 0; i < names.size() && i < 3; ++i)
        out += (i == 0 ? "" : ", ") + names[i];
    return names.size() > 3 ? out + " and " + std::to_string(names.size() - 3) + " more" : out;
}

// What lies below tz/ and beside the links that no link names, or that a
// cut stage left: one finding for each kind, however many there are, all
// cleared by tzlinks-update prune.
void
find_unnamed(finder& f)
{
    velm_simulation& tree = f.now();
    std::set<std::string> named = velm_named_updates(tree);
    std::vector<std::string> unnamed, leftovers;
    std::string updates = tree.where(velm_path::updates, true);
    for (const auto& [name, entry_kind] : tree.names(updates).value_or(velm_names())) {
        if (entry_kind != velm_entry::directory)
            continue;
        if (has_prefix(name, ".stage-"))
            leftovers.push_back(velm_path::updates + name);
        else if (named.count(velm_path::updates + name) == 0)
            unnamed.push_back(velm_path::updates + name);
    }
    std::string links = std::string(velm_path::link_directory) + "/";
    if (kind(tree, links + ".tz_latest.new") != velm_entry::absent)
        leftovers.push_back(links + ".tz_latest.new");
    velm_commands prune = {{velm_command::prune, "", ""}};
    // Named by the first of them: a later note about others, such as the
    // update a boot's adoption replaces, is another finding.
    if (!unnamed.empty())
        f.add("note", "update-unnamed", unnamed.front(),
              some_of(unnamed) + (unnamed.size() == 1 ? " is an update" : " are updates") +
                  " that no link names: nothing uses " + (unnamed.size() == 1 ? "it." : "them."))
            .tries = {prune};
    if (!leftovers.empty())
        f.add("note", "stage-leftover", velm_path::updates,
              some_of(leftovers) + (leftovers.size() == 1 ? " is" : " are") +
                  " what a cut tzlinks-update stage left.")
            .tries = {prune};
    velm_entry lock = tree.look(links + ".tzlinks-update.lock");
    if (lock.kind != velm_entry::absent && lock.kind != velm_entry::file)
        f.add("warning", "update-lock-wedged", links + ".tzlinks-update.lock",
              links + ".tzlinks-update.lock is no regular file: every tzlinks-update stage fails "
                      "until tzlinks-update prune clears it.")
            .tries = {prune};
}

// The first entries below path, a directory of an update in use, that
// programs other than root cannot read: a zone file or ICU data readable
// by root alone is as good as none to them.
void
unreadable_by_others(velm_simulation& tree, const std::string& path, int depth,
                     std::vector<std::string>& found)
{
    for (const auto& listed : tree.names(path).value_or(velm_names())) {
        const std::string& name = listed.first;
        velm_entry entry = tree.look(path + "/" + name);
        mode_t need = entry.kind == velm_entry::directory ? S_IROTH | S_IXOTH : S_IROTH;
        if (entry.kind != velm_entry::link && (entry.mode & need) != need)
            found.push_back(path + "/" + name);
        else if (entry.kind == velm_entry::directory && depth < 16 && found.size() < 4)
            unreadable_by_others(tree, path + "/" + name, depth + 1, found);
    }
}

// An update the links name that cannot serve the device: without the
// device's zone (in use, or once adopted, the device loses it); or, in use
// and kept by every boot, without its tz database or its ICU data. The
// repair ends on other data: back to what the device used, or on.
void
find_incomplete(finder& f, const std::string& root)
{
    const velm_report& r = f.r;
    velm_simulation& tree = f.now();
    bool zoneinfo = kind(tree, root + "/zoneinfo", true) == velm_entry::directory;
    std::string data = velm_icu_file(tree, root + "/icutz");
    bool kept = update_of(r.next_boot.zoneinfo) == root && r.after_next &&
                update_of(r.after_next->zoneinfo) == root;
    // Not yet in use: tz_latest back at the data in use, and the update
    // pruned; in use: a roll back, among the moves to other data.
    bool in_use = update_of(r.zoneinfo) == root;
    velm_commands back = r.live.present && !r.live.root.empty() && !in_use
                             ? velm_commands{ln(r.live.root, velm_path::latest_link)}
                             : velm_commands{rm(velm_path::latest_link)};
    if (kept && (!zoneinfo || data.empty()))
        f.add("error", "update-incomplete", root,
              root + ", which every boot keeps, has " +
                  (!zoneinfo ? "no tz database (zoneinfo/)" : "no ICU data the boot can use") +
                  ": it was copied in part.")
            .tries = with_moves(f, with_prune({back}));
    if (!zoneinfo || r.zone.empty() || velm_zone_file(tree, root + "/zoneinfo/" + r.zone))
        return;
    f.add(
         "warning", "update-lacks-zone", root,
         root + "/zoneinfo lacks " + r.zone + ", the device's zone: " +
             (in_use ? "programs have no zone but UTC." : "once it is in use, programs have none."))
        .tries = with_moves(f, with_prune({{}, back}));
}

// What is wrong inside the updates the links name, now or after the next
// boot.
void
find_updates(finder& f)
{
    const velm_report& r = f.r;
    std::set<std::string> named;
    for (const velm_text& link :
         {r.zoneinfo, r.icutz, r.tz_latest, r.next_boot.zoneinfo, r.next_boot.icutz})
        named.insert(update_of(link));
    named.erase("");
    velm_simulation& tree = f.now();
    for (const std::string& root : named) {
        if (kind(tree, root, true) != velm_entry::directory)
            continue;
        std::string name = root.substr(sizeof velm_path::updates - 1);
        velm_version_match match = velm_version_match_text(name);
        std::string word = velm_first_word(tree, root + "/zoneinfo/+VERSION");
        if (match.size == 5 && !word.empty() && word != match.group[1] + match.group[2])
            f.add("warning", "version-mismatch", root,
                  root + " holds the tz database " + word +
                      " (the first word of its +VERSION), though its name says " + match.group[1] +
                      match.group[2] + ": the boot orders it by its name.")
                .manual = "the tz database of release " + match.group[1] + match.group[2] + " in " +
                          root + "/zoneinfo, or a directory named for release " + word;
        std::string data = velm_icu_file(tree, root + "/icutz");
        if (!data.empty() && !velm_icu_data(tree, data))
            f.add("warning", "icu-data-bad", data,
                  data +
                      (tree.read(data, 1).value_or("").empty()
                           ? " is empty"
                           : " is no ICU data (it lacks the header ICU's data files begin with)") +
                      ": the boot goes by its name alone and uses it, and ICU's readers then "
                      "fail.")
                .manual = "ICU data built by ICU's tools as " + data;
        find_incomplete(f, root);
        std::vector<std::string> unreadable;
        unreadable_by_others(tree, root, 0, unreadable);
        if (!unreadable.empty())
            f.add("warning", "update-unreadable", root,
                  some_of(unreadable) + ", of the update " + root +
                      ", cannot be read by programs that do not run as root: to them its zones "
                      "or its ICU data are missing.")
                .manual = "read access for others to " + root + " (chmod -R a+rX " + root + ")";
    }
}

// The icutz link as the next boot leaves it, beside the data in use. A
// legacy /var/db/icutz that resolves goes with it, or the next boot
// migrates it back.
void
find_icutz(finder& f)
{
    const velm_run& next = f.r.next_boot;
    std::string update = update_of(next.zoneinfo);
    velm_commands unlink = {rm(velm_path::icutz_link)};
    if (kind(f.now(), velm_path::legacy_icu_link, true) != velm_entry::absent)
        unlink.push_back(rm(velm_path::legacy_icu_link));
    velm_simulation& tree = f.next();
    velm_entry icutz = tree.look(velm_path::icutz_link);
    bool leads = kind(tree, velm_path::icutz_link, true) == velm_entry::directory;
    if (icutz.kind == velm_entry::link && !leads)
        f.add("warning", "icutz-unusable", velm_path::icutz_link,
              "icutz names " + quoted(next.icutz) +
                  ", which loops or leads to no directory: ICU's readers find no data there, "
                  "and no boot changes that.")
            .tries = {update.empty() ? unlink : relink(update + "/icutz", velm_path::icutz_link)};
    else if (!update.empty() && next.icutz != update + "/icutz")
        f.add("warning", icutz.kind != velm_entry::absent ? "icutz-stale" : "icutz-missing",
              velm_path::icutz_link,
              "icutz names " + quoted(next.icutz) + ", not the ICU data of the update in use, " +
                  update +
                  ": ICU's readers use other data than the tz database, and no boot "
                  "changes that.")
            .tries = {relink(update + "/icutz", velm_path::icutz_link)};
    else if (update.empty() && icutz.kind != velm_entry::absent &&
             tree.where(velm_path::icutz_link, true) != tree.where(velm_path::system_icu, true))
        f.add("warning", "icutz-with-system", velm_path::icutz_link,
              "icutz is there while the system data is in use: ICU's readers use data that is "
              "not the system's, and no boot changes that.")
            .tries = {unlink};
}

// The next boot, and the links it leaves.
void
find_next_boot(finder& f)
{
    const velm_report& r = f.r;
    const velm_run& next = r.next_boot;
    velm_commands system = {rm(velm_path::zoneinfo_link), rm(velm_path::latest_link)};
    if (next.exit_status != 0) {
        // The entry it could not change, and why: the first refusal of the
        // kernel, or else the last failure.
        std::string failed;
        int why = 0;
        auto refusal = [](int error) {
            return error == EROFS || error == EACCES || error == EPERM;
        };
        for (const auto& [path, error] : next.refused) {
            if (!refusal(why))
                failed = path, why = error;
        }
        velm_finding& found = f.add(
            "error", "next-boot-fails", "",
            "The next boot cannot even link the system data" +
                (failed.empty() ? std::string() : " (" + failed + ": " + strerror(why) + ")") +
                ": it exits with status " + std::to_string(next.exit_status) +
                " and leaves localtime as it is.");
        if (refusal(why))
            found.manual = "write access for root to " + parent_of(failed) +
                           (why == EROFS ? ", on a file system mounted read-write" : "");
        else if (!failed.empty())
            found.tries = {clear(failed), {{velm_command::make_dirs, velm_path::updates, ""}}};
        else
            found.tries = {{}}, found.manual = "the repairs of the findings above";
        return;
    }
    // Back to the data in use, which the next boot would leave.
    velm_commands back = {rm(velm_path::latest_link)};
    if (r.live.present && !r.live.root.empty())
        back = {ln(r.live.root, velm_path::latest_link)};
    velm_simulation& tree = f.next();
    bool usable_now = kind(f.now(), velm_path::zoneinfo_link, true) == velm_entry::directory;
    if (usable_now && kind(f.next(), velm_path::zoneinfo_link, true) != velm_entry::directory)
        f.add("error", "next-boot-unusable", velm_path::zoneinfo_link,
              "The next boot links zoneinfo to " + quoted(next.zoneinfo) +
                  ", where there is no tz database: programs would fall back to UTC.")
            .tries = with_moves(f, with_prune({back, {rm(velm_path::latest_link)}, system}));
    find_icutz(f);
    (void)tree;
}

// A path with "." and ".." taken out, as a name: what a link spells, not
// where the kernel would lead, which is all a zone's name needs.
std::string
normalized(const std::string& path)
{
    std::vector<std::string> names;
    for (size_t at = 0; at < path.size();) {
        size_t end = std::min(path.find('/', at), path.size());
        std::string name = path.substr(at, end - at);
        if (name == ".." && !names.empty())
            names.pop_back();
        else if (!name.empty() && name != "." && name != "..")
            names.push_back(name);
        at = end + 1;
    }
    std::string out;
    for (const std::string& name : names)
        out += "/" + name;
    return out;
}

// The zone a link names, in any spelling (absolute, relative, through
// /usr/share/zoneinfo): the part of its target after a tz database's
// directory, the live one, the system's, /usr/share/zoneinfo or an
// update's; or else, link after link, of the first target that has one.
std::string
zone_named(velm_simulation& tree, std::string at)
{
    for (int hops = 0; hops < 40; ++hops) {
        velm_entry entry = tree.look(at);
        if (entry.kind != velm_entry::link || entry.text.empty())
            return "";
        at = normalized(entry.text[0] == '/' ? entry.text : parent_of(at) + "/" + entry.text);
        std::vector<std::string> tops = {velm_path::zoneinfo_link, velm_path::system_zoneinfo,
                                         velm_path::legacy_zoneinfo};
        if (!velm_update_of(at).empty())
            tops.push_back(velm_update_of(at) + "/zoneinfo");
        for (const std::string& top : tops) {
            if (has_prefix(at, (top + "/").c_str()))
                return at.substr(top.size() + 1);
        }
    }
    return "";
}

// The zone the device's programs use: the one /etc/localtime leads to,
// through localtime or not; where there is no /etc/localtime, the one
// localtime names.
std::string
device_zone(velm_simulation& tree)
{
    bool etc = kind(tree, velm_path::etc_localtime) != velm_entry::absent;
    return zone_named(tree, etc ? velm_path::etc_localtime : velm_path::localtime_link);
}

void
find_localtime(finder& f)
{
    const velm_report& r = f.r;
    const velm_run& next = r.next_boot;
    bool usable_now = velm_zone_file(f.now(), velm_path::localtime_link);
    const std::string& zone = r.zone;
    bool usable_next = velm_zone_file(f.next(), velm_path::localtime_link);
    std::string live = std::string(velm_path::zoneinfo_link) + "/";
    velm_commands to_zone = relink(live + zone, velm_path::localtime_link);
    std::string manual = "a link " + std::string(velm_path::localtime_link) + " to " + live +
                         "<zone>, naming a zone file of the data in use";
    if (!usable_now || !usable_next) {
        velm_finding& found =
            f.add("error", "localtime-unusable", velm_path::localtime_link,
                  "localtime names " + quoted(r.localtime) +
                      (usable_now ? ", a zone file" : ", which is no link to a zone file") +
                      "; the next boot leaves " + quoted(next.localtime) +
                      (usable_next
                           ? "."
                           : (usable_now ? ", which leads to none." : ", which is none either.")));
        found.manual = manual;
        found.tries = {{}};
        if (!zone.empty())
            found.tries.push_back(to_zone);
        // The boot's own default, said in the command rather than left to it.
        found.tries.push_back(relink(velm_path::default_localtime, velm_path::localtime_link));
    } else if (next.localtime != r.localtime && next.localtime == velm_path::default_localtime) {
        bool legacy =
            r.localtime &&
            has_prefix(*r.localtime, (velm_path::system_zoneinfo + std::string("/")).c_str());
        velm_finding& found =
            f.add("warning", legacy ? "localtime-legacy-default" : "localtime-reset",
                  velm_path::localtime_link,
                  "localtime names " + quoted(r.localtime) +
                      ", which the next boot does not accept: it sets the zone to " +
                      velm_path::default_zone + ".");
        found.manual = manual;
        if (!zone.empty())
            found.tries = {to_zone};
    }
}

// Whether programs read the device's zone: /etc/localtime must lead through
// the boot's localtime link. A tree without /etc (a copy of var/ and
// usr/share/ alone) has no say in it.
void
find_etc_localtime(finder& f)
{
    velm_simulation& tree = f.now();
    if (kind(tree, "/etc", true) != velm_entry::directory)
        return;
    std::string goal = tree.where(velm_path::localtime_link), at = velm_path::etc_localtime;
    bool through = false;
    for (int hops = 0; hops < 40 && !through; ++hops) {
        std::string here = tree.where(at);
        through = here == goal;
        velm_entry entry = tree.look(here);
        if (entry.kind != velm_entry::link)
            break;
        at = has_prefix(entry.text, "/") ? entry.text : parent_of(here) + "/" + entry.text;
    }
    if (through)
        return;
    // The zone it names is the one set (by timedatectl, say): kept when
    // the data in use holds it, by pointing localtime at it too.
    bool missing = kind(tree, velm_path::etc_localtime) == velm_entry::absent;
    const std::string& zone = f.r.zone;
    std::string live = std::string(velm_path::zoneinfo_link) + "/";
    bool other = !zone.empty() && zone != zone_named(tree, velm_path::localtime_link);
    bool held = other && velm_zone_file(f.next(), live + zone);
    velm_commands repair = relink(velm_path::localtime_link, velm_path::etc_localtime);
    if (held)
        repair.insert(repair.begin(), ln(live + zone, velm_path::localtime_link));
    if (held && kind(tree, velm_path::localtime_link) == velm_entry::directory)
        repair.insert(repair.begin(), rm(velm_path::localtime_link));
    f.add("warning", "etc-localtime", velm_path::etc_localtime,
          std::string(velm_path::etc_localtime) +
              (missing ? " is missing: programs use UTC, not the device's zone."
               : held  ? " names " + zone + ", but does not lead through " +
                            velm_path::localtime_link + ": the repair keeps that zone."
               : other
                   ? " names " + zone + ", which the data in use lacks, and does not lead " +
                         "through " + velm_path::localtime_link + ": the repair loses " + zone + "."
                   : " does not lead through " + std::string(velm_path::localtime_link) +
                         ": programs use another zone than the device's."))
        .tries = {repair};
}

void
find_record(finder& f)
{
    const velm_report& r = f.r;
    velm_simulation& tree = f.now();
    velm_entry record = tree.look(velm_path::record);
    if (record.kind != velm_entry::absent && (record.kind != velm_entry::file || record.shared))
        f.add("warning", "record-not-a-file", velm_path::record,
              std::string(velm_path::record) +
                  " is no regular file of its own: no adoption is ever recorded there.")
            .tries = {{rm(velm_path::record)}};
    // An adoption writes the record last: cut short, or failed, it leaves
    // the record of an earlier one. (No record at all is what an image
    // made with an update in place looks like.)
    std::string adopted = "_" + r.live.version;
    if (r.next_boot.action == "keep" && !update_of(r.next_boot.zoneinfo).empty() &&
        r.live.present && r.record &&
        (r.record->size() < adopted.size() ||
         r.record->compare(r.record->size() - adopted.size(), std::string::npos, adopted) != 0))
        f.add("note", "record-stale", velm_path::record,
              "The record reads \"" + *r.record + "\", which does not name the adoption of " +
                  r.live.version + ", the update in use.");
}

void
find_legacy(finder& f)
{
    for (const char* legacy : {velm_path::legacy_icu_link, velm_path::legacy_icu}) {
        if (kind(f.now(), legacy) == velm_entry::absent)
            continue;
        bool stays = kind(f.next(), legacy) != velm_entry::absent;
        velm_finding& found =
            f.add("note", "legacy-entries", legacy,
                  std::string(legacy) + (stays ? " is still there, and the next boot leaves it."
                                               : " is still there; the next boot clears it away."));
        if (stays)
            found.tries = {{rm(legacy)}};
    }
}

} // namespace

void
find_problems(velm_simulation& tree, velm_report& r)
{
    std::map<std::string, int> unread = tree.unread();
    finder f{tree, r};
    before_repair = &f.now();
    r.zone = device_zone(f.now());
    find_places(f);
    find_unread(f, unread);
    find_system_version(f);
    find_live(f);
    find_latest(f);
    find_updates(f);
    find_next_boot(f);
    find_localtime(f);
    find_etc_localtime(f);
    find_record(f);
    find_legacy(f);
    // Last: what to prune depends on the data the repairs above choose.
    find_unnamed(f);
}
