// SPDX-License-Identifier: Apache-2.0
// Pruning: updates no link names, and what an interrupted stage left. A
// link names an update when, read as the boot reads it or followed inside
// the tree, it leads into the update's directory.
#include "update/tree.h"
#include "update/update.h"

#include "support/paths.h"
#include "support/prefix.h"

#include <cerrno>
#include <cstdio>
#include <err.h>
#include <fcntl.h>
#include <set>
#include <sys/stat.h>
#include <unistd.h>

// The name below tz/ that a path lies in, or "".
static std::string
update_named(const std::string& path)
{
    static const size_t prefix = sizeof velm_path::updates - 1;
    if (!has_prefix(path, velm_path::updates))
        return "";
    return path.substr(prefix, path.find('/', prefix) - prefix);
}

static std::set<std::string>
named_updates(const velm_device& device)
{
    velm_simulation tree(device.fd);
    std::set<std::string> named;
    for (const char* link :
         {velm_path::zoneinfo_link, velm_path::icutz_link, velm_path::latest_link}) {
        velm_entry entry = tree.look(link);
        named.insert(update_named(entry.kind == velm_entry::link ? entry.text : ""));
        named.insert(update_named(tree.where(link, true)));
    }
    named.erase("");
    return named;
}

int
prune(const velm_device& device, bool dry_run)
{
    std::set<std::string> named = named_updates(device);
    std::string links_path = device.at(velm_path::link_directory);
    int links = open(links_path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    int updates = links < 0 ? -1 : openat(links, "tz", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (updates < 0) {
        warn("cannot read %s", (links_path + "/tz").c_str());
        return 74;
    }
    int status = 0;
    const char* done = dry_run ? "Would remove" : "Removed";
    for (const std::string& name : names_in(updates)) {
        std::string path = device.at(velm_path::updates + name);
        struct stat st;
        if (fstatat(updates, name.c_str(), &st, AT_SYMLINK_NOFOLLOW) != 0)
            continue;
        bool leftover = has_prefix(name, ".stage-");
        if (!S_ISDIR(st.st_mode) && !named.count(name)) {
            (void)printf("Left %s: it is no directory\n", path.c_str());
        } else if (S_ISDIR(st.st_mode) && (leftover || !named.count(name))) {
            if (!dry_run && !remove_all(updates, name)) {
                warn("cannot remove %s", path.c_str());
                status = 74;
                continue;
            }
            (void)printf("%s %s\n", done, path.c_str());
        }
    }
    struct stat st;
    if (fstatat(links, ".tz_latest.new", &st, AT_SYMLINK_NOFOLLOW) == 0) {
        std::string path = links_path + "/.tz_latest.new";
        if (!dry_run && unlinkat(links, ".tz_latest.new", 0) != 0 && errno != ENOENT) {
            warn("cannot remove %s", path.c_str());
            status = 74;
        } else {
            (void)printf("%s %s\n", done, path.c_str());
        }
    }
    (void)close(updates), (void)close(links);
    return status;
}
