// SPDX-License-Identifier: Apache-2.0
// The judgement of an update: it is grafted into a simulation of the device
// as tz/V, named by tz_latest, examined there with the rules the report
// uses, and the boot's own start-up sequence is run on it twice; what the
// boot decides, and why, is read off those runs.
#include "update/update.h"

#include "dataset/dataset.h"
#include "device/data.h"
#include "device/text.h"
#include "support/paths.h"
#include "support/prefix.h"
#include "support/version.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <err.h>
#include <sysexits.h>

const size_t longest_version = 255 - sizeof ".stage-" - 9 + 1;

namespace {

// The zone the device's localtime names in the live tree; "" for none.
std::string
zone_of(velm_simulation& tree)
{
    velm_text target = link_at(tree, velm_path::localtime_link);
    std::string live = std::string(velm_path::zoneinfo_link) + "/";
    return target && has_prefix(*target, live.c_str()) ? target->substr(live.size()) : "";
}

void
add(std::vector<velm_problem>& found, const char* severity, const char* id,
    const std::string& subject, const std::string& message, const std::string& manual)
{
    found.push_back({id, severity, subject, message, manual});
}

void
examine_version(const std::string& name, const std::string& version, const std::string& release,
                std::vector<velm_problem>& found)
{
    velm_version_match match = velm_version_match_text(version);
    if (match.size != 5)
        add(found, "error", "source-not-a-version", name,
            "\"" + version +
                "\" is not a version as the boot reads them (such as 2025b.1.0): "
                "no boot would adopt it.",
            "--as with a version, such as 2025b.1.0");
    else if (version.size() > longest_version)
        add(found, "error", "source-not-a-version", name,
            "\"" + version + "\" is too long a name for an update: at most " +
                std::to_string(longest_version) + " bytes can be staged.",
            "--as with a shorter version");
    std::string versions = name + "/zoneinfo/+VERSION";
    if (match.size == 5 && !release.empty() && release != match.group[1] + match.group[2])
        add(found, "error", "source-release-mismatch", versions,
            "The update holds the tz database " + release + ", but " + version + " says " +
                match.group[1] + match.group[2] + ".",
            "--as " + velm_release_version(release) + ", or the tz database of release " +
                match.group[1] + match.group[2]);
}

// What makes the update at root in the tree unusable, or not the device's.
void
examine(velm_simulation& tree, const std::string& root, const std::string& name,
        const std::string& zone, velm_source& walked, std::vector<velm_problem>& found)
{
    if (tree.look(root + "/zoneinfo", true).kind != velm_entry::directory)
        add(found, "error", "source-no-zoneinfo", name + "/zoneinfo",
            name + "/zoneinfo is no directory: the update has no tz database.",
            "the compiled tz database in " + name + "/zoneinfo");
    else if (velm_first_word(tree, root + "/zoneinfo/+VERSION").empty())
        add(found, "error", "source-no-release", name + "/zoneinfo/+VERSION",
            name + "/zoneinfo/+VERSION names no release: what the update holds cannot be told.",
            "the release, such as 2025b, as the first word of " + name + "/zoneinfo/+VERSION");
    else if (!zone.empty() && !velm_zone_file(tree, root + "/zoneinfo/" + zone))
        add(found, "warning", "source-lacks-zone", name + "/zoneinfo/" + zone,
            name + "/zoneinfo/" + zone +
                ", the device's zone, is no zone file: once it is in use, the device's localtime "
                "leads nowhere.",
            "the zone " + zone + " in " + name + "/zoneinfo");
    std::string data = velm_icu_file(tree, root + "/icutz");
    std::string shown_data = name + data.substr(std::min(root.size(), data.size()));
    if (data.empty())
        add(found, "error", "source-no-icu", name + "/icutz",
            name + "/icutz holds no ICU data the boot can use: a regular file "
                   "icutz<schema>.dat.",
            "the update's ICU data, such as icutz44l.dat, in " + name + "/icutz");
    else if (!velm_icu_data(tree, data))
        add(found, "error", "source-icu-bad", shown_data,
            shown_data +
                (tree.read(data, 1).value_or("").empty()
                     ? " is empty"
                     : " is no ICU data (it lacks the header ICU's data files begin with)") +
                ": ICU's readers would fail.",
            "ICU data built by ICU's tools as " + shown_data);
    // Links are judged where they lead, component by component, as the
    // kernel resolves them once the update is in place.
    for (const std::string& link : walked.links) {
        std::string canonical;
        velm_entry entry = tree.look(root + link, true, &canonical);
        if (entry.error == ELOOP)
            note_unsafe(walked, name, link, "is a link that loops");
        else if (canonical != root && !has_prefix(canonical, (root + "/").c_str()))
            note_unsafe(walked, name, link, "is a link that leads out of it");
    }
    finish_unsafe(walked, name);
}

// What the simulation could not read: of the update, a problem of it; of
// the device, what stops the judgement. A loop or a name too long is the
// tree's shape, which the boot meets as well, not a failure.
void
note_unread(const velm_simulation& tree, const std::string& root, const std::string& name,
            velm_source& walked, velm_judgement& j)
{
    for (const auto& [path, error] : tree.unread()) {
        if (error == EFBIG || error == ELOOP || error == ENAMETOOLONG)
            continue;
        if (path == root || has_prefix(path, (root + "/").c_str()))
            note_unsafe(walked, name, path.substr(root.size()),
                        std::string("cannot be read: ") + strerror(error));
        else if (j.error == 0)
            j.unread = path, j.error = error;
    }
}

} // namespace

velm_judgement
judge(const velm_device& device, int fd, const velm_source& walked_, const std::string& name,
      const std::string& version)
{
    velm_judgement j;
    velm_source walked = walked_;
    j.version = version;
    velm_simulation tree(device.fd);
    std::string zone = zone_of(tree);
    bool named = velm_version_match_text(version).size == 5 && version.size() <= longest_version;
    // Not a version: examined all the same, under a name no boot reads.
    std::string root = velm_path::updates + (named ? version : std::string(".source"));
    tree.graft(root, fd);
    std::vector<velm_problem> found;
    examine_version(name, version, velm_first_word(tree, root + "/zoneinfo/+VERSION"), found);
    examine(tree, root, name, zone, walked, found);
    if (named) {
        velm_entry link;
        std::string latest;
        link.kind = velm_entry::link, link.text = root, link.fresh = true;
        tree.look(velm_path::latest_link, false, &latest);
        tree.put(latest, link);
        j.next_boot = simulate_boot(tree);
        j.adopts = j.next_boot.adopted && j.next_boot.zoneinfo == root + "/zoneinfo";
        if (j.adopts)
            j.after = simulate_boot(tree);
    }
    note_unread(tree, root, name, walked, j);
    j.problems = walked.problems;
    j.problems.insert(j.problems.end(), found.begin(), found.end());
    bool usable = std::none_of(j.problems.begin(), j.problems.end(),
                               [](const velm_problem& p) { return p.severity == "error"; });
    auto refusal = refusal_of(j.next_boot, j.after ? &*j.after : nullptr);
    if (named && usable && refusal)
        add(j.problems, "warning", refusal->id.c_str(), name,
            name + " as " + version + ", " + refusal->reason +
                (j.adopts ? ": the next boot adopts it, and the boot after sets it aside."
                          : ": no boot adopts it."),
            "an update the device's boot keeps");
    else if (named && usable && !j.adopts)
        add(j.problems, "warning", "source-not-adopted", name,
            "The next boot does not adopt it: see what it says.", "an update the next boot adopts");
    bool warned = !j.next_boot.messages.empty() || (j.after && !j.after->kept);
    j.verdict = !j.problems.empty() ? refused : warned ? adopted_with_warnings : adopted_clean;
    return j;
}

int
copy_and_judge(const velm_device& device, int src, int copy, const std::string& name,
               const std::string& version, const char* consequence, velm_judgement& j)
{
    velm_source walked;
    if (!walk_source(src, copy, name, walked))
        return EX_IOERR;
    j = judge(device, copy, walked, name, version);
    if (j.error == 0)
        return 0;
    errno = j.error;
    warn("cannot read %s%s", shown(device.named(j.unread)).c_str(), consequence);
    return EX_IOERR;
}

bool
unusable(const velm_judgement& j)
{
    return std::any_of(j.problems.begin(), j.problems.end(),
                       [](const velm_problem& p) { return p.severity == "error"; });
}

std::string
judgement_text(const velm_judgement& j, const std::string& name)
{
    std::string out = "Update " + shown(name) + " as " + shown(j.version) + "\n";
    out += j.adopts ? "  The next boot adopts it.\n" : "  The next boot does not adopt it.\n";
    if (!j.next_boot.action.empty())
        out += "Next boot\n" + text_run(j.next_boot);
    out += j.problems.empty() ? "Problems: none.\n" : "Problems\n";
    for (const velm_problem& p : j.problems)
        out += "  " + p.severity + " " + p.id + ": " + shown(p.message) +
               "\n    Needs: " + shown(p.manual) + ".\n";
    if (j.after)
        out += "The boot after\n" + text_run(*j.after);
    return out;
}

std::string
judgement_json(const velm_judgement& j, const std::string& name)
{
    std::string problems;
    for (const velm_problem& p : j.problems)
        problems +=
            std::string(problems.empty() ? "" : ",") + "{\"id\":" + json_text(p.id) +
            ",\"severity\":" + json_text(p.severity) + ",\"subject\":" + json_text(p.subject) +
            ",\"message\":" + json_text(p.message) + ",\"manual\":" + json_text(p.manual) + "}";
    return "{\"source\":" + json_text(name) + ",\"version\":" + json_text(j.version) +
           ",\"adopts\":" + (j.adopts ? "true" : "false") +
           ",\"verdict\":" + std::to_string(j.verdict) +
           ",\"next_boot\":" + (j.next_boot.action.empty() ? "null" : json_run(j.next_boot)) +
           ",\"problems\":[" + problems + "],\"after\":" + (j.after ? json_run(*j.after) : "null") +
           "}\n";
}
