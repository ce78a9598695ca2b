// SPDX-License-Identifier: Apache-2.0
#include "device/simulation.h"

#include <algorithm>
#include <cerrno>
#include <dirent.h>
#include <fcntl.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

// A file longer than this is read only that far: no first word the boot
// reads, and no path, comes near it, and the report stays small whatever
// the tree holds.
static const size_t longest_read = size_t(64) * 1024;

// A path below a directory descriptor ("" for the directory, else "/a/b")
// as openat wants it.
static std::string
relative(const std::string& path)
{
    return path.empty() ? "." : path.substr(1);
}

static std::string
parent_of(const std::string& canonical)
{
    return canonical.substr(0, std::min(canonical.rfind('/'), canonical.size()));
}

// The flags of the file system a real entry lies on (ST_RDONLY, ST_NODEV).
static unsigned long
mount_flags(const velm_entry& entry)
{
    int fd = openat(entry.base, relative(entry.real).c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC);
    struct statvfs fs = {};
    bool known = fd >= 0 && fstatvfs(fd, &fs) == 0;
    if (fd >= 0)
        (void)close(fd);
    return known ? fs.f_flag : 0;
}

velm_simulation::velm_simulation(int root_fd) : root(root_fd), as_root(geteuid() == 0) {}

velm_simulation::~velm_simulation()
{
    settle();
}

// The real tree never changes under a report, so each entry is looked at
// once: a report looks at the same few paths over and over.
velm_entry
velm_simulation::real_entry(int base, const std::string& real)
{
    auto known = looked.find({base, real});
    if (known != looked.end())
        return known->second;
    velm_entry entry;
    entry.base = base, entry.real = real;
    struct stat st;
    if (fstatat(base, relative(real).c_str(), &st, AT_SYMLINK_NOFOLLOW) != 0) {
        entry.error = errno == ENOENT ? 0 : errno;
    } else {
        if (S_ISLNK(st.st_mode))
            entry.error = velm_fs::read_link_at(base, relative(real), entry.text);
        entry.shared = S_ISREG(st.st_mode) && st.st_nlink > 1;
        entry.mode = st.st_mode & 07777;
        entry.kind = S_ISLNK(st.st_mode)    ? velm_entry::link
                     : S_ISREG(st.st_mode)  ? velm_entry::file
                     : S_ISDIR(st.st_mode)  ? velm_entry::directory
                     : S_ISFIFO(st.st_mode) ? velm_entry::fifo
                     : S_ISSOCK(st.st_mode) ? velm_entry::socket
                                            : velm_entry::device;
    }
    return looked.emplace(std::make_pair(base, real), entry).first->second;
}

// The nearest change at or above a path decides what stands there: below a
// new directory nothing does yet, below a copy the original's entries do.
velm_entry
velm_simulation::entry_at(const std::string& canonical)
{
    for (std::string above = canonical;; above = parent_of(above)) {
        auto change = changed.find(above);
        if (change != changed.end()) {
            const velm_entry& entry = change->second;
            if (above == canonical)
                return entry;
            if (entry.kind != velm_entry::directory || entry.fresh)
                return velm_entry();
            return real_entry(entry.base, entry.real + canonical.substr(above.size()));
        }
        if (above.empty())
            return real_entry(root, canonical);
    }
}

// The components of a path, the first last, as the walk below takes them.
// A '/' at the end asks for a directory, as a "." after it does.
static void
push(std::vector<std::string>& todo, const std::string& text)
{
    if (!text.empty() && text.back() == '/')
        todo.emplace_back(".");
    for (size_t end = text.size(); end > 0;) {
        size_t slash = text.rfind('/', end - 1);
        size_t begin = slash == std::string::npos ? 0 : slash + 1;
        if (end > begin)
            todo.push_back(text.substr(begin, end - begin));
        end = slash == std::string::npos ? 0 : slash;
    }
}

// Walks path a component at a time, following links (the last one only
// when asked, or when a '/' ends the path or a link's target), an absolute
// target starting again from the root and ".." never leaving it. Fails as
// the kernel would: ENOENT, ENOTDIR, ELOOP, or what looking up an entry
// met.
velm_entry
velm_simulation::resolve(const std::string& path, bool follow, std::string& canonical)
{
    settle();
    velm_entry entry, failed;
    entry.kind = velm_entry::directory, failed.error = ENOENT;
    if (path.empty())
        return failed;
    std::vector<std::string> todo;
    push(todo, path);
    for (int links = 0; !todo.empty();) {
        std::string name = todo.back();
        todo.pop_back();
        if ((name == "." || name == "..") && entry.kind != velm_entry::directory) {
            failed.error = ENOTDIR;
            return failed;
        }
        if (name == "..")
            canonical = parent_of(canonical);
        if (name == "." || name == "..")
            continue;
        std::string next = canonical + "/" + name;
        entry = entry_at(next);
        if (entry.error != 0) {
            // Refused a look into a directory: the directory is what bars it.
            trouble.emplace(entry.error == EACCES ? canonical : next, entry.error);
            return entry;
        }
        if (entry.kind == velm_entry::link && (!todo.empty() || follow)) {
            failed.error = ++links > 40 ? ELOOP : entry.text.empty() ? ENOENT : 0;
            if (failed.error == ELOOP)
                trouble.emplace(path, ELOOP);
            if (failed.error != 0)
                return failed;
            if (entry.text[0] == '/')
                canonical.clear();
            push(todo, entry.text);
            entry = entry_at(canonical); // the directory the target starts from
        } else if (!todo.empty() && entry.kind != velm_entry::directory) {
            failed.error = entry.kind == velm_entry::absent ? ENOENT : ENOTDIR;
            return failed;
        } else {
            canonical = next;
        }
    }
    return entry;
}

velm_entry
velm_simulation::look(const std::string& path, bool follow, std::string* canonical)
{
    int saved = errno;
    std::string resolved;
    velm_entry entry = resolve(path, follow, resolved);
    if (canonical != nullptr)
        *canonical = resolved;
    errno = saved;
    return entry;
}

std::optional<std::string>
velm_simulation::read(const std::string& path, size_t limit)
{
    int saved = errno;
    std::string canonical;
    velm_entry entry = resolve(path, true, canonical);
    std::optional<std::string> text;
    int fd = entry.kind == velm_entry::file ? open_for_reading(canonical, entry, 0) : -1;
    struct stat st;
    if (fd >= 0) {
        text.emplace(limit, '\0');
        ssize_t n = pread(fd, text->data(), limit, 0);
        text->resize(static_cast<size_t>(std::max(n, ssize_t(0))));
        if (n < 0)
            trouble.emplace(canonical, errno), text.reset();
        else if (fstat(fd, &st) == 0 && st.st_size > static_cast<off_t>(limit) && limit > 64)
            trouble.emplace(canonical, EFBIG);
        (void)close(fd);
    }
    errno = saved;
    return text;
}

// The names below a real directory and their kinds, as its listing tells
// them: 0, or the errno of a listing that could not be made whole.
static int
list(const velm_entry& directory, velm_names& found)
{
    int fd = openat(directory.base, relative(directory.real).c_str(),
                    O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    std::vector<std::string> names;
    std::vector<unsigned char> types;
    int error = fd < 0 ? errno : velm_fs::names_in(fd, names, &types);
    for (size_t i = 0; i < names.size(); ++i) {
        struct stat st = {};
        unsigned char type = types[i];
        if (type == DT_UNKNOWN && fstatat(fd, names[i].c_str(), &st, AT_SYMLINK_NOFOLLOW) == 0)
            type = IFTODT(st.st_mode);
        found[names[i]] = type == DT_LNK    ? velm_entry::link
                          : type == DT_REG  ? velm_entry::file
                          : type == DT_DIR  ? velm_entry::directory
                          : type == DT_FIFO ? velm_entry::fifo
                          : type == DT_SOCK ? velm_entry::socket
                                            : velm_entry::device;
    }
    if (fd >= 0)
        (void)close(fd);
    return error;
}

std::optional<velm_names>
velm_simulation::names(const std::string& path)
{
    int saved = errno;
    std::string canonical;
    velm_entry entry = resolve(path, true, canonical);
    auto known = listed.find({entry.base, entry.real});
    if (entry.kind == velm_entry::directory && !entry.fresh && known == listed.end()) {
        velm_names real;
        int error = list(entry, real);
        known = listed.emplace(std::make_pair(entry.base, entry.real), std::make_pair(error, real))
                    .first;
    }
    int error = entry.kind != velm_entry::directory ? -1 : entry.fresh ? 0 : known->second.first;
    velm_names found = error == 0 && !entry.fresh ? known->second.second : velm_names();
    if (error > 0)
        trouble.emplace(canonical, error);
    // What the simulation changed right below it.
    std::string prefix = canonical + "/";
    for (auto c = changed.lower_bound(prefix); error == 0 && c != changed.end(); ++c) {
        if (c->first.compare(0, prefix.size(), prefix) != 0)
            break;
        std::string name = c->first.substr(prefix.size());
        if (name.find('/') == std::string::npos && c->second.kind == velm_entry::absent)
            found.erase(name);
        else if (name.find('/') == std::string::npos)
            found[name] = c->second.kind;
    }
    errno = saved;
    return error != 0 ? std::nullopt : std::optional<velm_names>(found);
}

void
velm_simulation::io_failed(const std::string& path, int error)
{
    trouble.emplace(where(path, true), error);
}

velm_simulation::changes
velm_simulation::checkpoint()
{
    settle();
    return changed;
}

void
velm_simulation::rewind(const changes& to)
{
    settle();
    changed = to;
}

void
velm_simulation::put(const std::string& canonical, const velm_entry& made)
{
    settle();
    changed[canonical] = made;
}

void
velm_simulation::graft(const std::string& path, int outside)
{
    velm_entry copy;
    copy.kind = velm_entry::directory, copy.base = outside;
    put(where(path), copy);
}

bool
velm_simulation::written(const std::string& path)
{
    return writes.count(where(path)) != 0;
}

void
velm_simulation::forget_writes()
{
    settle();
    writes.clear();
}

int
velm_simulation::fail(int error)
{
    errno = error;
    return -1;
}

// Writes to files open for writing reach the tree's model once they are
// done: the boot opens, writes and closes the record in one go.
void
velm_simulation::settle()
{
    for (const auto& [fd, canonical] : pending) {
        velm_entry file;
        file.kind = velm_entry::file, file.fresh = true;
        file.text.resize(static_cast<size_t>(std::max(lseek(fd, 0, SEEK_END), off_t(0))));
        file.text.resize(static_cast<size_t>(
            std::max(pread(fd, file.text.data(), file.text.size(), 0), ssize_t(0))));
        changed[canonical] = file;
        writes.insert(canonical);
        (void)close(fd);
    }
    pending.clear();
}

// Each call below leaves errno as the real call would: untouched on
// success, whatever the lookups inside it did; on failure, the first error
// in the kernel's own order of checks. A new directory lies on the file
// system of the real one above it.
int
velm_simulation::may_change_in(const std::string& directory)
{
    std::string real = directory;
    velm_entry entry = entry_at(real);
    while (entry.fresh || entry.kind != velm_entry::directory) {
        if (real.empty())
            return 0;
        entry = entry_at(real = parent_of(real));
    }
    if ((mount_flags(entry) & ST_RDONLY) != 0)
        return EROFS;
    if (!as_root || real != directory)
        return 0;
    return faccessat(entry.base, relative(entry.real).c_str(), W_OK | X_OK, AT_EACCESS) == 0
               ? 0
               : errno;
}

// Whether the boot may open an existing entry for writing. Another user
// than root foresees a read-only file system alone.
int
velm_simulation::may_write(const velm_entry& entry)
{
    if (entry.fresh)
        return 0;
    if (!as_root)
        return entry.kind == velm_entry::file && (mount_flags(entry) & ST_RDONLY) != 0 ? EROFS : 0;
    return faccessat(entry.base, relative(entry.real).c_str(), W_OK,
                     AT_EACCESS | AT_SYMLINK_NOFOLLOW) == 0
               ? 0
               : errno;
}

// What the kernel checks, in its order, before it removes an entry by
// unlink or rmdir alike: 0 when nothing stands in the way. An immutable or
// append-only file or directory cannot be removed.
int
velm_simulation::may_remove(const char* path, std::string& canonical, velm_entry& entry)
{
    entry = resolve(path, false, canonical);
    if (entry.error != 0)
        return entry.error;
    int error = may_change_in(parent_of(canonical));
    if (error == EROFS)
        return error;
    if (entry.kind == velm_entry::absent)
        return ENOENT;
    if (error != 0 || entry.fresh ||
        (entry.kind != velm_entry::file && entry.kind != velm_entry::directory))
        return error;
    int fd = openat(entry.base, relative(entry.real).c_str(),
                    O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
    int flags = 0;
    bool got = fd >= 0 && ioctl(fd, FS_IOC_GETFLAGS, &flags) == 0;
    if (fd >= 0)
        (void)close(fd);
    return got && (flags & (FS_IMMUTABLE_FL | FS_APPEND_FL)) != 0 ? EPERM : 0;
}

int
velm_simulation::unlink_entry(const char* path)
{
    int saved = errno;
    std::string canonical;
    velm_entry entry;
    if (int error = may_remove(path, canonical, entry); error != 0)
        return fail(error);
    if (entry.kind == velm_entry::directory)
        return fail(EISDIR);
    changed[canonical] = velm_entry();
    errno = saved;
    return 0;
}

int
velm_simulation::unlink(const char* path)
{
    int removed = unlink_entry(path);
    if (removed != 0 && errno != ENOENT)
        refusals.emplace_back(path, errno);
    return removed;
}

int
velm_simulation::access(const char* path)
{
    int saved = errno;
    velm_entry entry = look(path, true);
    if (entry.error != 0 || entry.kind == velm_entry::absent)
        return fail(entry.error != 0 ? entry.error : ENOENT);
    errno = saved;
    return 0;
}

ssize_t
velm_simulation::readlink(const char* path, char* buffer, size_t size)
{
    int saved = errno;
    velm_entry entry = look(path);
    if (entry.error != 0 || entry.kind != velm_entry::link)
        return fail(entry.error != 0                   ? entry.error
                    : entry.kind == velm_entry::absent ? ENOENT
                                                       : EINVAL);
    size_t n = entry.text.copy(buffer, size);
    errno = saved;
    return static_cast<ssize_t>(n);
}

int
velm_simulation::symlink(const char* target, const char* path)
{
    int saved = errno;
    std::string canonical;
    velm_entry entry = resolve(path, false, canonical);
    int error = *target == '\0'                    ? ENOENT
                : entry.error != 0                 ? entry.error
                : entry.kind != velm_entry::absent ? EEXIST
                                                   : may_change_in(parent_of(canonical));
    if (error != 0) {
        refusals.emplace_back(path, error);
        return fail(error);
    }
    velm_entry link;
    link.kind = velm_entry::link, link.text = target, link.fresh = true;
    changed[canonical] = link;
    errno = saved;
    return 0;
}

// As the C library does it: unlink, and rmdir when that meets a directory,
// which leaves unlink's EISDIR in errno. What the simulated run removed
// below the directory before is already gone from its listing.
int
velm_simulation::remove(const char* path)
{
    int removed = unlink_entry(path), saved = errno;
    if (removed == 0 || errno != EISDIR)
        return removed;
    std::string canonical;
    velm_entry entry;
    if (int error = may_remove(path, canonical, entry); error != 0)
        return fail(error);
    auto inside = names(canonical);
    if (!inside || !inside->empty())
        return fail(ENOTEMPTY);
    changed[canonical] = velm_entry();
    errno = saved;
    return 0;
}

// An anonymous file holding text, open for reading and writing.
static int
anonymous_file(const std::string& text)
{
    int fd = memfd_create("simulated", MFD_CLOEXEC);
    if (fd >= 0 && pwrite(fd, text.data(), text.size(), 0) != static_cast<ssize_t>(text.size())) {
        (void)close(fd);
        return -1;
    }
    return fd;
}

// A descriptor that only describes an entry (fstat works, nothing else):
// what the boot gets for a FIFO, a device or a file it will not touch,
// without opening any of them. A device on a file system mounted without
// devices cannot be opened at all.
static int
description_of(const velm_entry& entry)
{
    if (entry.kind == velm_entry::device && (mount_flags(entry) & ST_NODEV) != 0) {
        errno = EACCES;
        return -1;
    }
    return openat(entry.base, relative(entry.real).c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC);
}

int
velm_simulation::open_for_writing(const std::string& canonical, const velm_entry& entry)
{
    int error = entry.kind == velm_entry::absent      ? may_change_in(parent_of(canonical))
                : entry.kind == velm_entry::link      ? ELOOP
                : entry.kind == velm_entry::directory ? EISDIR
                                                      : may_write(entry);
    if (error == 0 && (entry.kind == velm_entry::fifo || entry.kind == velm_entry::socket))
        error = ENXIO; // a FIFO has no reader at boot
    if (error != 0)
        return fail(error);
    if (entry.kind == velm_entry::device || entry.shared)
        return description_of(entry);
    std::optional<std::string> text = entry.fresh ? entry.text : read(canonical, longest_read);
    int fd = anonymous_file(text.value_or(""));
    int kept = fd < 0 ? -1 : dup(fd);
    if (kept < 0) {
        if (fd >= 0)
            (void)close(fd);
        return fail(ENOMEM);
    }
    pending.emplace_back(kept, canonical);
    return fd;
}

int
velm_simulation::open_for_reading(const std::string& canonical, const velm_entry& entry, int flags)
{
    if ((flags & O_DIRECTORY) != 0 && entry.kind != velm_entry::directory)
        return fail(ENOTDIR);
    if (entry.kind == velm_entry::socket)
        return fail(ENXIO);
    if (entry.kind == velm_entry::fifo || entry.kind == velm_entry::device)
        return description_of(entry);
    if (entry.fresh) // a new directory lists nothing the boot looks for
        return entry.kind == velm_entry::file
                   ? anonymous_file(entry.text)
                   : openat(root, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    int fd = openat(entry.base, relative(entry.real).c_str(),
                    O_RDONLY | O_NONBLOCK | O_CLOEXEC | (flags & O_DIRECTORY));
    struct stat st;
    if (fd < 0)
        trouble.emplace(canonical, errno);
    if (fd < 0 || fstat(fd, &st) != 0 || !S_ISREG(st.st_mode) ||
        st.st_size <= static_cast<off_t>(longest_read))
        return fd;
    std::string start(longest_read, '\0');
    ssize_t n = pread(fd, start.data(), start.size(), 0);
    (void)close(fd);
    start.resize(static_cast<size_t>(std::max(n, ssize_t(0))));
    trouble.emplace(canonical, EFBIG);
    return anonymous_file(start);
}

int
velm_simulation::open(const char* path, int flags, mode_t /*mode*/)
{
    int saved = errno;
    std::string canonical;
    velm_entry entry = resolve(path, (flags & O_NOFOLLOW) == 0, canonical);
    if (entry.error != 0)
        return fail(entry.error);
    bool writing = (flags & O_ACCMODE) != O_RDONLY;
    if (entry.kind == velm_entry::absent && !(writing && (flags & O_CREAT) != 0))
        return fail(ENOENT);
    int fd =
        writing ? open_for_writing(canonical, entry) : open_for_reading(canonical, entry, flags);
    if (fd >= 0)
        errno = saved;
    return fd;
}
