// SPDX-License-Identifier: Apache-2.0
// Staging: the update is copied beside the others under a name no link
// knows, made durable, renamed to its version, and only then named by
// tz_latest, through a new link renamed over the old one. A cut anywhere
// leaves tz_latest naming the update it named before, or the whole new one.
#include "update/tree.h"
#include "update/update.h"

#include "support/paths.h"

#include <cerrno>
#include <cstdio>
#include <err.h>
#include <fcntl.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

static const int directory_flags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
static const char new_link[] = ".tz_latest.new";

// A new, empty directory .stage-V.<random> below updates; "" when none
// can be made.
static std::string
staging_directory(int updates, const std::string& version)
{
    for (int tries = 0; tries < 16; ++tries) {
        unsigned int random = 0;
        if (getrandom(&random, sizeof random, 0) != sizeof random)
            break;
        char suffix[16];
        (void)snprintf(suffix, sizeof suffix, ".%08x", random);
        std::string name = ".stage-" + version + suffix;
        if (mkdirat(updates, name.c_str(), 0700) == 0)
            return name;
        if (errno != EEXIST)
            break;
    }
    return "";
}

// Copies src in below updates as version, durable before it has that name.
static int
place(const velm_device& device, int updates, int src, const std::string& version)
{
    std::string staging = staging_directory(updates, version);
    int to = staging.empty() ? -1 : openat(updates, staging.c_str(), directory_flags);
    bool placed = to >= 0 && copy_into(src, to);
    struct stat st;
    placed = placed && fstat(src, &st) == 0 && fchmod(to, st.st_mode & 0777) == 0 &&
             syncfs(to) == 0 &&
             renameat2(updates, staging.c_str(), updates, version.c_str(), RENAME_NOREPLACE) == 0 &&
             fsync(updates) == 0;
    if (!placed)
        warn("cannot stage %s", device.at(velm_path::updates + version).c_str());
    if (to >= 0)
        (void)close(to);
    // What is left of a failed copy goes now, or with the next prune.
    if (!placed && !staging.empty())
        (void)remove_all(updates, staging);
    return placed ? 0 : 74;
}

// Points tz_latest at the update: a new link, renamed over the old one.
static int
name_latest(const velm_device& device, int links, const std::string& root)
{
    char target[4096];
    ssize_t n = readlinkat(links, "tz_latest", target, sizeof target);
    if (n >= 0 && std::string(target, static_cast<size_t>(n)) == root)
        return 0;
    bool named = (unlinkat(links, new_link, 0) == 0 || errno == ENOENT) &&
                 symlinkat(root.c_str(), links, new_link) == 0 &&
                 renameat(links, new_link, links, "tz_latest") == 0 && fsync(links) == 0;
    if (!named)
        warn("cannot point %s at %s", device.at(velm_path::latest_link).c_str(), root.c_str());
    return named ? 0 : 74;
}

int
stage(const velm_device& device, int src, const std::string& version)
{
    std::string links_path = device.at(velm_path::link_directory);
    int links = open(links_path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (links < 0 || ((mkdirat(links, "tz", 0755) != 0 && errno != EEXIST))) {
        warn("cannot open %s", (links < 0 ? links_path : links_path + "/tz").c_str());
        return 74;
    }
    int updates = openat(links, "tz", directory_flags);
    int existing = updates < 0 ? -1 : openat(updates, version.c_str(), directory_flags);
    int status = updates < 0 ? 74 : 0;
    if (status == 0 && existing >= 0 && !same_content(src, existing)) {
        warnx("%s holds another update already: pick another version with --as",
              device.at(velm_path::updates + version).c_str());
        status = 2;
    } else if (status == 0 && existing < 0) {
        status = place(device, updates, src, version);
    }
    if (status == 0)
        status = name_latest(device, links, velm_path::updates + version);
    if (status == 0)
        (void)printf("%s %s as %s\n", existing >= 0 ? "Reused" : "Staged",
                     device.at(velm_path::updates + version).c_str(), version.c_str());
    for (int fd : {existing, updates, links}) {
        if (fd >= 0)
            (void)close(fd);
    }
    return status;
}
