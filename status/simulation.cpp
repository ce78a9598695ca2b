// SPDX-License-Identifier: Apache-2.0
#include "status/simulation.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

// A canonical path ("" for the root, else "/a/b") as openat wants it.
static std::string
relative(const std::string& canonical)
{
    return canonical.empty() ? "." : canonical.substr(1);
}

velm_entry
velm_simulation::real_entry(const std::string& canonical) const
{
    velm_entry entry;
    struct stat st;
    if (fstatat(root, relative(canonical).c_str(), &st, AT_SYMLINK_NOFOLLOW) != 0) {
        entry.error = errno == ENOENT ? 0 : errno;
        return entry;
    }
    if (S_ISLNK(st.st_mode)) {
        std::vector<char> target(static_cast<size_t>(st.st_size) + 4096);
        ssize_t n = readlinkat(root, relative(canonical).c_str(), target.data(), target.size());
        entry.text.assign(target.data(), n > 0 ? static_cast<size_t>(n) : 0);
    }
    entry.shared = S_ISREG(st.st_mode) && st.st_nlink > 1;
    entry.kind = S_ISLNK(st.st_mode)   ? velm_entry::link
                 : S_ISREG(st.st_mode) ? velm_entry::file
                 : S_ISDIR(st.st_mode) ? velm_entry::directory
                                       : velm_entry::other;
    return entry;
}

velm_entry
velm_simulation::entry_at(const std::string& canonical) const
{
    auto change = changed.find(canonical);
    return change != changed.end() ? change->second : real_entry(canonical);
}

// Walks path a component at a time, following links (the last one only
// when asked), an absolute target starting again from the root and ".."
// never leaving it. Fails as the kernel would: ENOENT, ENOTDIR, ELOOP.
velm_entry
velm_simulation::resolve(const std::string& path, bool follow, std::string& canonical) const
{
    std::vector<std::string> todo; // components still to walk, the next one last
    auto push = [&todo](const std::string& text) {
        for (size_t end = text.size(); end > 0;) {
            size_t slash = text.rfind('/', end - 1);
            size_t begin = slash == std::string::npos ? 0 : slash + 1;
            if (end > begin)
                todo.push_back(text.substr(begin, end - begin));
            end = slash == std::string::npos ? 0 : slash;
        }
    };
    velm_entry failed;
    if (path.empty()) {
        failed.error = ENOENT;
        return failed;
    }
    push(path);
    bool must_be_directory = path.back() == '/';
    velm_entry entry;
    entry.kind = velm_entry::directory;
    for (int links = 0; !todo.empty();) {
        std::string name = todo.back();
        todo.pop_back();
        if (name == "..")
            canonical.erase(std::min(canonical.rfind('/'), canonical.size()));
        if (name == "." || name == "..")
            continue;
        std::string next = canonical;
        next.append("/").append(name);
        entry = entry_at(next);
        bool last = todo.empty();
        if (entry.error != 0)
            return entry;
        if (entry.kind == velm_entry::link && (!last || follow || must_be_directory)) {
            failed.error = ++links > 40 ? ELOOP : entry.text.empty() ? ENOENT : 0;
            if (failed.error != 0)
                return failed;
            if (entry.text[0] == '/')
                canonical.clear();
            push(entry.text);
            continue;
        }
        if (!last && entry.kind != velm_entry::directory) {
            failed.error = entry.kind == velm_entry::absent ? ENOENT : ENOTDIR;
            return failed;
        }
        canonical = next;
    }
    if (must_be_directory && entry.kind != velm_entry::directory)
        failed.error = entry.kind == velm_entry::absent ? ENOENT : ENOTDIR;
    return failed.error != 0 ? failed : entry;
}

velm_entry
velm_simulation::look(const std::string& path, bool follow) const
{
    int saved = errno;
    std::string canonical;
    velm_entry entry = resolve(path, follow, canonical);
    errno = saved;
    return entry;
}

bool
velm_simulation::written(const std::string& path) const
{
    std::string canonical;
    resolve(path, false, canonical);
    return writes.count(canonical) != 0;
}

int
velm_simulation::fail(int error) const
{
    errno = error;
    return -1;
}

// Each call below leaves errno as the real call would: untouched on
// success, whatever the lookups inside it did.

int
velm_simulation::unlink(const char* path) const
{
    int saved = errno;
    std::string canonical;
    velm_entry entry = resolve(path, false, canonical);
    if (entry.error != 0 || entry.kind == velm_entry::absent)
        return fail(entry.error != 0 ? entry.error : ENOENT);
    if (entry.kind == velm_entry::directory)
        return fail(EISDIR);
    changed[canonical] = velm_entry();
    errno = saved;
    return 0;
}

int
velm_simulation::access(const char* path) const
{
    int saved = errno;
    std::string canonical;
    velm_entry entry = resolve(path, true, canonical);
    if (entry.error != 0 || entry.kind == velm_entry::absent)
        return fail(entry.error != 0 ? entry.error : ENOENT);
    errno = saved;
    return 0;
}

ssize_t
velm_simulation::readlink(const char* path, char* buffer, size_t size) const
{
    int saved = errno;
    std::string canonical;
    velm_entry entry = resolve(path, false, canonical);
    if (entry.error != 0 || entry.kind == velm_entry::absent)
        return fail(entry.error != 0 ? entry.error : ENOENT);
    if (entry.kind != velm_entry::link)
        return fail(EINVAL);
    size_t n = entry.text.copy(buffer, size);
    errno = saved;
    return static_cast<ssize_t>(n);
}

int
velm_simulation::symlink(
    const char* target, // NOLINT(bugprone-easily-swappable-parameters): symlink(2)'s order
    const char* path) const
{
    int saved = errno;
    std::string canonical;
    velm_entry entry = resolve(path, false, canonical);
    if (entry.error != 0)
        return fail(entry.error);
    if (entry.kind != velm_entry::absent)
        return fail(EEXIST);
    if (*target == '\0')
        return fail(ENOENT);
    changed[canonical] = velm_entry{velm_entry::link, target, 0, false};
    errno = saved;
    return 0;
}

// The simulated run removes nothing below a directory before it removes
// the directory itself, so what the directory really holds decides.
bool
velm_simulation::empty_directory(const std::string& canonical) const
{
    int fd =
        openat(root, relative(canonical).c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    DIR* directory = fd < 0 ? nullptr : fdopendir(fd);
    bool empty = directory != nullptr;
    // cppcheck-suppress readdirCalled ; one thread, one directory stream
    while (const struct dirent* child = empty ? readdir(directory) : nullptr)
        empty = strcmp(child->d_name, ".") == 0 || strcmp(child->d_name, "..") == 0;
    if (directory != nullptr)
        closedir(directory);
    return empty;
}

int
velm_simulation::remove(const char* path) const
{
    int saved = errno;
    std::string canonical;
    velm_entry entry = resolve(path, false, canonical);
    if (entry.error != 0 || entry.kind == velm_entry::absent)
        return fail(entry.error != 0 ? entry.error : ENOENT);
    if (entry.kind == velm_entry::directory && !empty_directory(canonical))
        return fail(ENOTEMPTY);
    changed[canonical] = velm_entry();
    // The C library's remove tries unlink first, which fails on a
    // directory and leaves EISDIR behind even when rmdir then succeeds.
    errno = entry.kind == velm_entry::directory ? EISDIR : saved;
    return 0;
}

int
velm_simulation::open_for_reading(const char* path, int flags) const
{
    int saved = errno;
    std::string canonical;
    velm_entry entry = resolve(path, true, canonical);
    if (entry.error != 0 || entry.kind == velm_entry::absent)
        return fail(entry.error != 0 ? entry.error : ENOENT);
    if ((flags & O_DIRECTORY) != 0 && entry.kind != velm_entry::directory)
        return fail(ENOTDIR);
    int fd = openat(root, relative(canonical).c_str(),
                    O_RDONLY | O_NONBLOCK | O_NOFOLLOW | O_CLOEXEC | flags);
    if (fd >= 0)
        errno = saved;
    return fd;
}

// What the real call leaves in errno, too: the error of an open that
// fails (O_NOFOLLOW refuses a link, a FIFO without a reader refuses a
// writer), untouched when the open works.
void
velm_simulation::write_file(const char* path, const std::string& text) const
{
    int saved = errno;
    std::string canonical;
    velm_entry entry = resolve(path, false, canonical);
    int error = entry.error != 0                      ? entry.error
                : entry.kind == velm_entry::link      ? ELOOP
                : entry.kind == velm_entry::directory ? EISDIR
                : entry.kind == velm_entry::other     ? ENXIO
                                                      : 0;
    errno = error != 0 ? error : saved;
    // A file with other names is opened, then left alone.
    if (error == 0 && !entry.shared) {
        changed[canonical] = velm_entry{velm_entry::file, text, 0, false};
        writes[canonical] = true;
    }
}

void
velm_simulation::set_protection_class(const char* path, int /*protection_class*/) const
{
    // Opened and closed as the real call does, for what that leaves in
    // errno; the class itself is never set.
    int fd = open_for_reading(path, 0);
    if (fd >= 0) // a close(-1) would leave EBADF where the real call leaves the open's error
        (void)close(fd);
}
