// SPDX-License-Identifier: Apache-2.0
// SRC, walked by descriptor: every entry looked at once, never through a
// link, within fixed bounds, and copied as it was read. What it holds is
// judged afterwards on the copy, so that a source changing meanwhile can
// only spoil its own copy, never slip something past the checks.
#include "update/tree.h"
#include "update/update.h"

#include "dataset/first_word.h"
#include "device/text.h"
#include "support/fs.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <err.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

// No tz database nests deeper than 4 levels (zoneinfo/right/America/
// Argentina) nor has a file near 64 MiB; a whole one with ICU's data is
// some 10 MiB. Beyond these, a source is no update.
const int deepest = 16;
const off_t largest_file = off_t(64) << 20;
const unsigned long long largest_update = 512ULL << 20;
// Entries reported as unsafe; a tree can hold thousands.
const size_t most_unsafe = 8;
const int directory_flags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

struct walker {
    const std::string& name; // SRC, as given
    velm_source& found;
    dev_t device;

    // An entry left out, and why: the walk goes on.
    bool unsafe(const std::string& path, const std::string& why)
    {
        note_unsafe(found, name, path, why);
        return true;
    }
    // A copy that could not be written, said: the walk stops.
    bool failed(const std::string& path)
    {
        warn("cannot copy %s", shown(name + path).c_str());
        return false;
    }
    bool walk(int from, int to, const std::string& at, int depth);
    bool entry(int from, int to, const std::string& at, const std::string& child, int depth);
    bool file(int in, int to, const std::string& path);
};

// The entry below from that fstatat described, opened without following
// a link; -1 when it cannot be, or is no longer what was looked at.
int
reopen(int from, const std::string& child, const struct stat& was, int flags, std::string& why)
{
    int fd = openat(from, child.c_str(), flags);
    struct stat st;
    if (fd < 0) {
        why = std::string("cannot be read: ") + strerror(errno);
    } else if (fstat(fd, &st) != 0 || st.st_ino != was.st_ino || st.st_dev != was.st_dev) {
        why = "changed while it was read";
        (void)close(fd);
        fd = -1;
    }
    return fd;
}

// A regular file's bytes into a new file of to, 0644; false when the
// write failed (said). What SRC does meanwhile spoils only this copy.
bool
walker::file(int in, int to, const std::string& path)
{
    std::string child = path.substr(path.rfind('/') + 1);
    int out = openat(to, child.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644);
    bool copied = out >= 0 && fchmod(out, 0644) == 0;
    char buffer[65536];
    off_t total = 0;
    ssize_t n = 0;
    while (copied && (n = read(in, buffer, sizeof buffer)) > 0 && (total += n) <= largest_file)
        copied = write(out, buffer, static_cast<size_t>(n)) == n;
    if (copied && n < 0)
        unsafe(path, std::string("cannot be read: ") + strerror(errno));
    else if (copied && n > 0)
        unsafe(path, "grew while it was copied");
    if (out >= 0 && close(out) != 0)
        copied = false;
    return copied || failed(path);
}

bool
walker::entry(int from, int to, const std::string& at, const std::string& child, int depth)
{
    std::string path = at + "/" + child, why;
    struct stat st;
    if (fstatat(from, child.c_str(), &st, AT_SYMLINK_NOFOLLOW) != 0)
        return unsafe(path, std::string("cannot be looked at: ") + strerror(errno));
    if (st.st_dev != device)
        return unsafe(path, "lies on another file system");
    if (S_ISLNK(st.st_mode)) {
        std::string target;
        if (int error = velm_fs::read_link_at(from, child, target); error != 0)
            return unsafe(path, std::string("cannot be read: ") + strerror(error));
        found.links.push_back(path);
        if (symlinkat(target.c_str(), to, child.c_str()) != 0)
            return failed(path);
        return true;
    }
    if (!S_ISDIR(st.st_mode) && !S_ISREG(st.st_mode))
        return unsafe(path, S_ISFIFO(st.st_mode)   ? "is a FIFO"
                            : S_ISSOCK(st.st_mode) ? "is a socket"
                                                   : "is a device");
    if (S_ISDIR(st.st_mode) && depth >= deepest)
        return unsafe(path, "lies deeper than " + std::to_string(deepest) + " levels");
    if (S_ISREG(st.st_mode) &&
        (st.st_size > largest_file ||
         (found.bytes += static_cast<unsigned long long>(st.st_size)) > largest_update))
        return unsafe(path, "is larger than an update's file can be");
    int in = reopen(from, child, st,
                    S_ISDIR(st.st_mode) ? directory_flags
                                        : O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC,
                    why);
    if (in < 0)
        return unsafe(path, why);
    bool done = true;
    if (S_ISREG(st.st_mode)) {
        done = file(in, to, path);
    } else {
        int out = -1;
        if (mkdirat(to, child.c_str(), 0700) != 0 ||
            (out = openat(to, child.c_str(), directory_flags)) < 0)
            done = failed(path);
        done = done && walk(in, out, path, depth + 1);
        if (done && fchmod(out, 0755) != 0)
            done = failed(path);
        if (out >= 0)
            (void)close(out);
    }
    (void)close(in);
    return done;
}

bool
walker::walk(int from, int to, const std::string& at, int depth)
{
    std::vector<std::string> names;
    if (int error = velm_fs::names_in(from, names); error != 0)
        unsafe(at, std::string("cannot be listed: ") + strerror(error));
    for (const std::string& child : names) {
        if (!entry(from, to, at, child, depth))
            return false;
    }
    return true;
}

} // namespace

void
note_unsafe(velm_source& found, const std::string& name, const std::string& path,
            const std::string& why)
{
    if (found.unsafe++ < most_unsafe)
        found.problems.push_back(
            {"source-unsafe", "error", name + path,
             name + path + " " + why +
                 ": an update holds only directories, regular files and "
                 "links that stay inside it.",
             path.empty() ? "a readable " + name : name + " without " + path.substr(1)});
}

void
finish_unsafe(velm_source& found, const std::string& name)
{
    if (found.unsafe > most_unsafe)
        found.problems.push_back({"source-unsafe", "error", name,
                                  std::to_string(found.unsafe - most_unsafe) + " more entries of " +
                                      name + " are unsafe as well.",
                                  name + " without them"});
    found.unsafe = std::min(found.unsafe, most_unsafe);
}

bool
walk_source(int src, int to, const std::string& name, velm_source& found)
{
    struct stat st;
    if (fstat(src, &st) != 0) {
        warn("cannot read %s", shown(name).c_str());
        return false;
    }
    walker w{name, found, st.st_dev};
    return w.walk(src, to, "", 0);
}

std::string
source_release(int src)
{
    int zoneinfo = openat(src, "zoneinfo", directory_flags);
    int fd = zoneinfo < 0
                 ? -1
                 : openat(zoneinfo, "+VERSION", O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
    struct stat st;
    std::string word;
    if (fd >= 0 && fstat(fd, &st) == 0 && S_ISREG(st.st_mode))
        (void)first_word_of(fd, word, 256);
    for (int open : {fd, zoneinfo}) {
        if (open >= 0)
            (void)close(open);
    }
    return word;
}
