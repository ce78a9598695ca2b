// SPDX-License-Identifier: Apache-2.0
// Pruning: updates no link names, and what an interrupted stage left. A
// link names an update when, read as the boot reads it or followed inside
// the tree, it leads into the update's directory. Nothing is removed on
// what could not be read.
#include "update/tree.h"
#include "update/update.h"

#include "support/fs.h"

#include "device/data.h"
#include "device/text.h"
#include "support/paths.h"
#include "support/prefix.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <err.h>
#include <fcntl.h>
#include <set>
#include <sys/stat.h>
#include <sysexits.h>
#include <unistd.h>

// Removes name below dir, or says it would: 0, or EX_IOERR (said).
static int
remove_named(int dir, const std::string& name, const std::string& path, bool dry_run)
{
    std::string failed;
    if (int error = dry_run ? 0 : remove_all(dir, name, &failed); error != 0) {
        errno = error;
        warn("cannot remove %s",
             shown(path + (failed.size() > name.size() ? failed.substr(name.size()) : "")).c_str());
        return EX_IOERR;
    }
    (void)printf("%s %s\n", dry_run ? "Would remove" : "Removed", shown(path).c_str());
    return 0;
}

int
prune(const velm_device& device, int links, bool dry_run)
{
    velm_simulation tree(device.fd);
    std::string unread;
    std::set<std::string> named = velm_named_updates(tree, &unread);
    if (!unread.empty()) {
        errno = tree.unread().at(unread);
        warn("cannot read %s; nothing was removed", shown(device.named(unread)).c_str());
        return EX_IOERR;
    }
    std::string top = device.named(velm_path::updates);
    int updates = device.open_directory(velm_path::updates);
    std::vector<std::string> names;
    int error = updates < 0 ? errno : velm_fs::names_in(updates, names);
    if (error != 0 && !(updates < 0 && error == ENOENT)) {
        errno = error;
        warn("cannot read %s; nothing was removed", shown(top).c_str());
        if (updates >= 0)
            (void)close(updates);
        return EX_IOERR;
    }
    int status = 0;
    for (const std::string& name : names) {
        struct stat st;
        std::string root = velm_path::updates + name;
        if (fstatat(updates, name.c_str(), &st, AT_SYMLINK_NOFOLLOW) != 0) {
            warn("cannot read %s; left", shown(device.named(root)).c_str());
            status = EX_IOERR;
        } else if (!S_ISDIR(st.st_mode) && named.count(root) == 0) {
            (void)printf("Left %s: it is no directory\n", shown(device.named(root)).c_str());
        } else if (S_ISDIR(st.st_mode) && (has_prefix(name, ".stage-") || named.count(root) == 0)) {
            status = std::max(status, remove_named(updates, name, device.named(root), dry_run));
        }
    }
    if (updates >= 0)
        (void)close(updates);
    struct stat st;
    if (fstatat(links, ".tz_latest.new", &st, AT_SYMLINK_NOFOLLOW) == 0)
        status = std::max(status, remove_named(links, ".tz_latest.new",
                                               device.named(velm_path::link_directory +
                                                            std::string("/.tz_latest.new")),
                                               dry_run));
    return status;
}
