// SPDX-License-Identifier: Apache-2.0
#include "support/fs.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <dirent.h>
#include <err.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

int
velm_system_calls::unlink(const char* path)
{
    return ::unlink(path);
}

int
velm_system_calls::access(const char* path)
{
    return ::access(path, F_OK);
}

ssize_t
velm_system_calls::readlink(const char* path, char* buffer, size_t size)
{
    return ::readlink(path, buffer, size);
}

int
velm_system_calls::symlink(const char* target, const char* path)
{
    return ::symlink(target, path);
}

int
velm_system_calls::remove(const char* path)
{
    return std::remove(path);
}

int
velm_system_calls::open(const char* path, int flags, mode_t mode)
{
    return ::open(path, flags, mode);
}

static velm_system_calls real_calls;
static velm_system_calls* calls_in_use = &real_calls;

velm_system_calls&
system_calls()
{
    return *calls_in_use;
}

velm_calls_in_use::velm_calls_in_use(velm_system_calls& calls) : saved(calls_in_use)
{
    calls_in_use = &calls;
}

velm_calls_in_use::~velm_calls_in_use()
{
    calls_in_use = saved;
}

namespace velm_fs {

void
remove(const std::string& path)
{
    if (system_calls().unlink(path.c_str()) == 0 || errno == ENOENT)
        return;
    warn("remove: could not remove %s", path.c_str());
    throw errno;
}

bool
path_exists(const std::string& path)
{
    return system_calls().access(path.c_str()) == 0;
}

std::string
read_symlink(const std::string& path)
{
    char buffer[1025];
    ssize_t n = system_calls().readlink(path.c_str(), buffer, 1024);
    if (n >= 0) {
        buffer[n] = '\0';
        return std::string(buffer, static_cast<size_t>(n));
    }
    if (errno == ENOENT)
        return std::string();
    warn("read_symlink: %s", path.c_str());
    throw errno;
}

void
create_symlink(const std::string& target, const std::string& link_path)
{
    if (system_calls().symlink(target.c_str(), link_path.c_str()) == 0)
        return;
    warn("create_symlink: from %s to %s", link_path.c_str(), target.c_str());
    throw errno;
}

int
read_link_at(int dir, const std::string& name, std::string& target)
{
    for (size_t size = 256;; size *= 4) {
        target.resize(size);
        ssize_t n = readlinkat(dir, name.c_str(), target.data(), size);
        if (n < 0)
            return errno;
        if (static_cast<size_t>(n) < size) {
            target.resize(static_cast<size_t>(n));
            return 0;
        }
    }
}

int
names_in(int dir, std::vector<std::string>& names, std::vector<unsigned char>* types)
{
    int listing = openat(dir, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    DIR* entries = listing < 0 ? nullptr : fdopendir(listing);
    if (entries == nullptr) {
        int error = errno;
        if (listing >= 0)
            (void)close(listing);
        return error;
    }
    errno = 0;
    // cppcheck-suppress readdirCalled ; one thread, one directory stream
    while (const struct dirent* entry = readdir(entries)) {
        if (strcmp(entry->d_name, ".") == 0 || strcmp(entry->d_name, "..") == 0)
            continue;
        names.emplace_back(entry->d_name);
        if (types != nullptr)
            types->push_back(entry->d_type);
    }
    int error = errno;
    closedir(entries);
    return error;
}

void
write_own_file(const std::string& path, const std::string& text)
{
    // Not through a link, which could aim the write at any file of the
    // system, and not into a FIFO or a device: O_NONBLOCK makes a FIFO
    // without a reader fail at once, and fstat tells the rest. A file with
    // another name (a hard link) is not ours either, so it is truncated
    // only once it is known to have no other name. An empty file, as a new
    // one is, needs no truncating; and truncating one makes some file
    // systems write it out at close, which is felt at boot.
    int fd = system_calls().open(path.c_str(),
                                 O_WRONLY | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0666);
    if (fd < 0)
        return;
    struct stat st;
    bool done = fstat(fd, &st) == 0;
    if (done && S_ISREG(st.st_mode) && st.st_nlink <= 1)
        done = (st.st_size == 0 || ftruncate(fd, 0) == 0) &&
               ::write(fd, text.data(), text.size()) == static_cast<ssize_t>(text.size());
    if (!done)
        system_calls().io_failed(path, errno);
    (void)::close(fd);
}

} // namespace velm_fs
