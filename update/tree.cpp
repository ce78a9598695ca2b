// SPDX-License-Identifier: Apache-2.0
// Whole directory trees, each below a directory descriptor: copied, compared
// and removed without ever following a link.
#include "update/tree.h"

#include <cerrno>
#include <cstring>
#include <dirent.h>
#include <err.h>
#include <fcntl.h>
#include <set>
#include <sys/stat.h>
#include <unistd.h>

static const int directory_flags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

std::vector<std::string>
names_in(int dir)
{
    std::vector<std::string> names;
    int listing = dup(dir);
    DIR* entries = listing < 0 ? nullptr : fdopendir(listing);
    if (entries == nullptr && listing >= 0)
        (void)close(listing);
    // A duplicate shares the position of a listing made before.
    if (entries != nullptr)
        rewinddir(entries);
    // cppcheck-suppress readdirCalled ; one thread, one directory stream
    while (const struct dirent* entry = entries != nullptr ? readdir(entries) : nullptr) {
        if (strcmp(entry->d_name, ".") != 0 && strcmp(entry->d_name, "..") != 0)
            names.emplace_back(entry->d_name);
    }
    if (entries != nullptr)
        closedir(entries);
    return names;
}

// A file's bytes into a new file of the same permission bits.
static bool
copy_file(int from, const char* name, int to, mode_t mode)
{
    int in = openat(from, name, O_RDONLY | O_NOFOLLOW | O_CLOEXEC);
    int out =
        in < 0 ? -1 : openat(to, name, O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0600);
    bool copied = out >= 0;
    char buffer[65536];
    for (ssize_t n; copied && (n = read(in, buffer, sizeof buffer)) != 0;)
        copied = n > 0 && write(out, buffer, static_cast<size_t>(n)) == n;
    copied = copied && fchmod(out, mode & 0777) == 0;
    if (out >= 0 && close(out) != 0)
        copied = false;
    if (in >= 0)
        (void)close(in);
    return copied;
}

bool
copy_into(int from, int to)
{
    for (const std::string& name : names_in(from)) {
        struct stat st;
        bool copied = fstatat(from, name.c_str(), &st, AT_SYMLINK_NOFOLLOW) == 0;
        if (copied && S_ISDIR(st.st_mode)) {
            // Writable until filled; its own permission bits last.
            int in = -1, out = -1;
            copied = mkdirat(to, name.c_str(), 0700) == 0 &&
                     (in = openat(from, name.c_str(), directory_flags)) >= 0 &&
                     (out = openat(to, name.c_str(), directory_flags)) >= 0 && copy_into(in, out) &&
                     fchmod(out, st.st_mode & 0777) == 0;
            for (int fd : {in, out}) {
                if (fd >= 0)
                    (void)close(fd);
            }
        } else if (copied && S_ISLNK(st.st_mode)) {
            std::string target(static_cast<size_t>(st.st_size) + 1, '\0');
            ssize_t n = readlinkat(from, name.c_str(), target.data(), target.size());
            copied = n >= 0 && static_cast<size_t>(n) < target.size();
            target.resize(copied ? static_cast<size_t>(n) : 0);
            copied = copied && symlinkat(target.c_str(), to, name.c_str()) == 0;
        } else if (copied) {
            copied = S_ISREG(st.st_mode) && copy_file(from, name.c_str(), to, st.st_mode);
        }
        if (!copied) {
            warn("cannot copy %s", name.c_str());
            return false;
        }
    }
    return true;
}

static bool
same_file(int a, int b)
{
    char left[65536], right[65536];
    for (;;) {
        ssize_t n = read(a, left, sizeof left), m = read(b, right, sizeof right);
        if (n != m || n < 0)
            return false;
        if (n == 0)
            return true;
        if (memcmp(left, right, static_cast<size_t>(n)) != 0)
            return false;
    }
}

bool
same_content(int a, int b)
{
    std::vector<std::string> names = names_in(a), others = names_in(b);
    if (std::set<std::string>(names.begin(), names.end()) !=
        std::set<std::string>(others.begin(), others.end()))
        return false;
    for (const std::string& name : names) {
        struct stat x, y;
        if (fstatat(a, name.c_str(), &x, AT_SYMLINK_NOFOLLOW) != 0 ||
            fstatat(b, name.c_str(), &y, AT_SYMLINK_NOFOLLOW) != 0 ||
            (x.st_mode & S_IFMT) != (y.st_mode & S_IFMT))
            return false;
        int flags = S_ISDIR(x.st_mode) ? directory_flags : O_RDONLY | O_NOFOLLOW | O_CLOEXEC;
        bool same = true;
        if (S_ISLNK(x.st_mode)) {
            char left[4096], right[4096];
            ssize_t n = readlinkat(a, name.c_str(), left, sizeof left);
            ssize_t m = readlinkat(b, name.c_str(), right, sizeof right);
            same = n == m && n >= 0 && memcmp(left, right, static_cast<size_t>(n)) == 0;
        } else {
            int fa = openat(a, name.c_str(), flags), fb = openat(b, name.c_str(), flags);
            same =
                fa >= 0 && fb >= 0 && (S_ISDIR(x.st_mode) ? same_content(fa, fb) : same_file(fa, fb));
            for (int fd : {fa, fb}) {
                if (fd >= 0)
                    (void)close(fd);
            }
        }
        if (!same)
            return false;
    }
    return true;
}

bool
remove_all(int dir, const std::string& name)
{
    struct stat st;
    if (fstatat(dir, name.c_str(), &st, AT_SYMLINK_NOFOLLOW) != 0)
        return errno == ENOENT;
    if (!S_ISDIR(st.st_mode))
        return unlinkat(dir, name.c_str(), 0) == 0 || errno == ENOENT;
    int fd = openat(dir, name.c_str(), directory_flags);
    bool removed = fd >= 0;
    for (const std::string& child : removed ? names_in(fd) : std::vector<std::string>())
        removed = remove_all(fd, child) && removed;
    if (fd >= 0)
        (void)close(fd);
    return removed && (unlinkat(dir, name.c_str(), AT_REMOVEDIR) == 0 || errno == ENOENT);
}
