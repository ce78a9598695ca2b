// SPDX-License-Identifier: Apache-2.0
// Staging: SRC is copied beside the other updates under a name no link
// knows, the copy is judged, made durable, renamed to its version, and only
// then named by tz_latest, through a new link renamed over the old one. A
// cut anywhere leaves tz_latest naming the update it named before, or the
// whole new one; what a cut leaves goes with the next stage or prune.
#include "update/tree.h"
#include "update/update.h"

#include "device/text.h"
#include "support/fs.h"
#include "support/paths.h"
#include "support/prefix.h"

#include <cerrno>
#include <cstdio>
#include <err.h>
#include <fcntl.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <sysexits.h>
#include <unistd.h>

static const int directory_flags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
static const char new_link[] = ".tz_latest.new";

// A new, empty directory .stage-V.<random> below updates; "" when none
// can be made (said).
static std::string
staging_directory(int updates, const std::string& version)
{
    for (int tries = 0; tries < 16; ++tries) {
        unsigned int random = 0;
        if (getrandom(&random, sizeof random, 0) != sizeof random)
            break;
        char suffix[16];
        (void)snprintf(suffix, sizeof suffix, ".%08x", random);
        // Cut, so that a version too long to stage is refused by check
        // like every other unusable name, not by mkdir.
        std::string name = ".stage-" + version.substr(0, longest_version) + suffix;
        if (mkdirat(updates, name.c_str(), 0700) == 0)
            return name;
        if (errno != EEXIST)
            break;
    }
    warn("cannot make a staging directory for %s", shown(version).c_str());
    return "";
}

// What a cut stage left: its staging directories, and its new link. Only
// a stage makes them, and this one holds the lock.
static int
clear_leftovers(const velm_device& device, int links, int updates)
{
    std::vector<std::string> names;
    int error = velm_fs::names_in(updates, names);
    for (const std::string& name : names) {
        if (error == 0 && has_prefix(name, ".stage-"))
            error = remove_all(updates, name);
    }
    if (error == 0)
        error = remove_all(links, new_link);
    if (error != 0) {
        errno = error;
        warn("cannot clear what a cut stage left in %s",
             shown(device.named(velm_path::updates)).c_str());
    }
    return error;
}

// Points tz_latest at the update: a new link, renamed over the old one.
static int
name_latest(const velm_device& device, int links, const std::string& root)
{
    std::string target, latest = shown(device.named(velm_path::latest_link));
    if (velm_fs::read_link_at(links, "tz_latest", target) == 0 && target == root)
        return 0;
    if (symlinkat(root.c_str(), links, new_link) != 0 ||
        renameat(links, new_link, links, "tz_latest") != 0) {
        warn("cannot point %s at %s", latest.c_str(), root.c_str());
        return EX_IOERR;
    }
    if (fsync(links) != 0) {
        warn("%s names %s, but may name the update before after a power cut", latest.c_str(),
             root.c_str());
        return EX_IOERR;
    }
    return 0;
}

// The copy in place as tz/version, durable before it has that name.
static int
place(const velm_device& device, int updates, int copy, const std::string& staging,
      const std::string& version)
{
    std::string path = shown(device.named(velm_path::updates + version));
    if (fchmod(copy, 0755) != 0 || syncfs(copy) != 0) {
        warn("cannot make the copy of %s durable; nothing was staged", path.c_str());
        return EX_IOERR;
    }
    if (renameat2(updates, staging.c_str(), updates, version.c_str(), RENAME_NOREPLACE) != 0) {
        warn("cannot stage %s; nothing was staged", path.c_str());
        return EX_IOERR;
    }
    if (fsync(updates) != 0) {
        warn("%s is in place, but may be gone after a power cut: tz_latest left as it was",
             path.c_str());
        return EX_IOERR;
    }
    return 0;
}

// Whether an update already at tz/version is the very same as the copy:
// 0 it is (made durable), 2 it is not, EX_IOERR when it cannot be told.
static int
reuse(const velm_device& device, int copy, int existing, const std::string& version)
{
    std::string path = shown(device.named(velm_path::updates + version));
    int same = same_content(copy, existing);
    if (same < 0 || (same == 1 && syncfs(existing) != 0)) {
        warn("cannot compare or make durable %s", path.c_str());
        return EX_IOERR;
    }
    if (same == 0) {
        warnx("%s holds another update already: pick another version with --as; nothing was "
              "staged",
              path.c_str());
        return refused;
    }
    return 0;
}

static int
open_updates(const velm_device& device, int links)
{
    int updates = device.open_directory(velm_path::updates);
    if (updates < 0 && errno == ENOENT && mkdirat(links, "tz", 0755) == 0)
        updates = device.open_directory(velm_path::updates);
    if (updates < 0)
        warn("cannot open %s", shown(device.named(velm_path::updates)).c_str());
    return updates;
}

// Copies and judges; then places, or reuses, and names. updates and copy
// are closed by the caller, the copy removed.
static int
copy_judge_place(const velm_device& device, int links, int updates, int src,
                 const std::string& name, const std::string& version, bool force,
                 const std::string& staging, int copy)
{
    velm_judgement j;
    if (copy_and_judge(device, src, copy, name, version, "; nothing was staged", j) != 0)
        return EX_IOERR;
    if (unusable(j) || (j.verdict == refused && !force)) {
        (void)fputs(judgement_text(j, name).c_str(), stdout);
        warnx("%s is refused; nothing was staged", shown(name).c_str());
        return refused;
    }
    int existing = openat(updates, version.c_str(), directory_flags);
    int status = existing >= 0 ? reuse(device, copy, existing, version)
                               : place(device, updates, copy, staging, version);
    if (existing >= 0)
        (void)close(existing);
    if (status == 0)
        status = name_latest(device, links, velm_path::updates + version);
    if (status != 0)
        return status;
    (void)printf("%s %s as %s\n", existing >= 0 ? "Reused" : "Staged",
                 shown(device.named(velm_path::updates + version)).c_str(), shown(version).c_str());
    velm_simulation now(device.fd);
    (void)fputs(("Next boot\n" + text_run(simulate_boot(now))).c_str(), stdout);
    return 0;
}

int
stage(const velm_device& device, int links, int src, const std::string& name,
      const std::string& version, bool force)
{
    int updates = open_updates(device, links);
    if (updates < 0 || clear_leftovers(device, links, updates) != 0)
        return EX_IOERR;
    std::string staging = staging_directory(updates, version);
    int copy = staging.empty() ? -1 : openat(updates, staging.c_str(), directory_flags);
    int status = copy < 0 ? EX_IOERR
                          : copy_judge_place(device, links, updates, src, name, version, force,
                                             staging, copy);
    if (copy >= 0)
        (void)close(copy);
    // Gone once renamed; otherwise now, or with the next stage or prune.
    if (!staging.empty())
        (void)remove_all(updates, staging);
    (void)close(updates);
    return status;
}
