// SPDX-License-Identifier: Apache-2.0
#include "update/tree.h"

#include "support/fs.h"

#include <cerrno>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <set>
#include <sys/stat.h>
#include <unistd.h>

static const int directory_flags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

// Whether two open files hold the same bytes: 1, 0, or -1.
static int
same_file(int a, int b)
{
    char left[65536], right[65536];
    for (;;) {
        ssize_t n = read(a, left, sizeof left), m = read(b, right, sizeof right);
        if (n < 0 || m < 0)
            return -1;
        if (n != m || memcmp(left, right, static_cast<size_t>(n)) != 0)
            return 0;
        if (n == 0)
            return 1;
    }
}

// Whether the entry name is the same below both: 1, 0, or -1.
static int
same_entry(int a, int b, const std::string& name)
{
    struct stat x, y;
    if (fstatat(a, name.c_str(), &x, AT_SYMLINK_NOFOLLOW) != 0 ||
        fstatat(b, name.c_str(), &y, AT_SYMLINK_NOFOLLOW) != 0)
        return errno == ENOENT ? 0 : -1;
    if (x.st_mode != y.st_mode)
        return 0;
    if (S_ISLNK(x.st_mode)) {
        std::string left, right;
        if (velm_fs::read_link_at(a, name, left) != 0 || velm_fs::read_link_at(b, name, right) != 0)
            return -1;
        return left == right ? 1 : 0;
    }
    int flags = S_ISDIR(x.st_mode) ? directory_flags : O_RDONLY | O_NOFOLLOW | O_CLOEXEC;
    int fa = openat(a, name.c_str(), flags), fb = openat(b, name.c_str(), flags);
    int same = fa < 0 || fb < 0     ? -1
               : S_ISDIR(x.st_mode) ? same_content(fa, fb)
                                    : same_file(fa, fb);
    int error = errno;
    for (int fd : {fa, fb}) {
        if (fd >= 0)
            (void)close(fd);
    }
    errno = error;
    return same;
}

int
same_content(int a, int b)
{
    std::vector<std::string> names, others;
    if (velm_fs::names_in(a, names) != 0 || velm_fs::names_in(b, others) != 0)
        return -1;
    if (std::set<std::string>(names.begin(), names.end()) !=
        std::set<std::string>(others.begin(), others.end()))
        return 0;
    for (const std::string& name : names) {
        if (int same = same_entry(a, b, name); same != 1)
            return same;
    }
    return 1;
}

// Empties the directory fd of everything but directories on its file
// system, which it lists in below: 0, or the first errno.
static int
clear_files(int fd, dev_t device, std::vector<std::string>& below, std::string& failed)
{
    std::vector<std::string> names;
    int error = velm_fs::names_in(fd, names);
    for (const std::string& name : names) {
        struct stat st;
        int now = 0;
        if (fstatat(fd, name.c_str(), &st, AT_SYMLINK_NOFOLLOW) != 0)
            now = errno == ENOENT ? 0 : errno;
        else if (S_ISDIR(st.st_mode) && st.st_dev == device)
            below.push_back(name);
        else if (unlinkat(fd, name.c_str(), S_ISDIR(st.st_mode) ? AT_REMOVEDIR : 0) != 0)
            now = S_ISDIR(st.st_mode) ? EBUSY : errno; // a mount point
        if (now != 0 && error == 0)
            error = now, failed = name;
    }
    return error;
}

static std::string
joined(const std::vector<std::string>& path)
{
    std::string out;
    for (const std::string& step : path)
        out += (out.empty() ? "" : "/") + step;
    return out;
}

// Depth first without recursion: one directory open at a time, however
// deep the tree, going back up by "..", which cannot lead elsewhere while
// the lock is held, and is checked all the same.
int
remove_all(int dir, const std::string& name, std::string* failed)
{
    struct stat top;
    if (fstatat(dir, name.c_str(), &top, AT_SYMLINK_NOFOLLOW) != 0)
        return errno == ENOENT ? 0 : errno;
    if (!S_ISDIR(top.st_mode))
        return unlinkat(dir, name.c_str(), 0) == 0 || errno == ENOENT ? 0 : errno;
    std::vector<std::string> path = {name}; // the directories walked down
    std::vector<ino_t> inodes = {top.st_ino};
    int fd = openat(dir, name.c_str(), directory_flags), error = fd < 0 ? errno : 0;
    while (fd >= 0) {
        std::vector<std::string> below;
        std::string entry;
        if (int now = clear_files(fd, top.st_dev, below, entry); now != 0 && error == 0) {
            error = now;
            if (failed != nullptr)
                *failed = joined(path) + "/" + entry;
        }
        struct stat st;
        int next = below.empty() ? openat(fd, "..", directory_flags)
                                 : openat(fd, below.front().c_str(), directory_flags);
        bool down = !below.empty();
        (void)close(fd);
        fd = next;
        if (fd < 0 || fstat(fd, &st) != 0) {
            error = error != 0 ? error : errno;
            break;
        }
        if (down) {
            path.push_back(below.front()), inodes.push_back(st.st_ino);
            continue;
        }
        // Back up one level: the directory just emptied goes, unless
        // something in it could not.
        bool home = path.size() == 1;
        if (!home && st.st_ino != inodes[inodes.size() - 2]) {
            error = error != 0 ? error : ESTALE;
            break;
        }
        int parent = home ? dir : fd;
        if (error == 0 && unlinkat(parent, path.back().c_str(), AT_REMOVEDIR) != 0) {
            error = errno;
            if (failed != nullptr)
                *failed = joined(path);
        }
        path.pop_back(), inodes.pop_back();
        if (home || error != 0)
            break;
    }
    if (fd >= 0)
        (void)close(fd);
    return error == ENOENT ? 0 : error;
}
