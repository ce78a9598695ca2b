// SPDX-License-Identifier: Apache-2.0
#include "support/fs.h"

#include <cerrno>
#include <cstdio>
#include <err.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

int
velm_system_calls::unlink(const char* path) const
{
    return ::unlink(path);
}

int
velm_system_calls::access(const char* path) const
{
    return ::access(path, F_OK);
}

ssize_t
velm_system_calls::readlink(const char* path, char* buffer, size_t size) const
{
    return ::readlink(path, buffer, size);
}

int
velm_system_calls::symlink(const char* target, const char* path) const
{
    return ::symlink(target, path);
}

int
velm_system_calls::remove(const char* path) const
{
    return std::remove(path);
}

int
velm_system_calls::open_for_reading(const char* path, int flags) const
{
    // A FIFO opened without O_NONBLOCK waits for a writer, for ever at boot.
    return ::open(path, O_RDONLY | O_NONBLOCK | O_CLOEXEC | flags);
}

void
velm_system_calls::write_file(const char* path, const std::string& text) const
{
    // Not through a link, which could aim the write at any file of the
    // system, and not into a FIFO or a device: O_NONBLOCK makes a FIFO
    // without a reader fail at once, and fstat tells the rest. A file with
    // another name (a hard link) is not this tool's either, so it is
    // truncated only once it is known to be the record alone. An empty
    // file, as a new one is, needs no truncating; and truncating one makes
    // some file systems write it out at close, which is felt at boot.
    int fd = ::open(path, O_WRONLY | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0666);
    if (fd < 0)
        return;
    struct stat st;
    if (fstat(fd, &st) == 0 && S_ISREG(st.st_mode) && st.st_nlink == 1 &&
        (st.st_size == 0 || ftruncate(fd, 0) == 0))
        (void)::write(fd, text.data(), text.size());
    (void)::close(fd);
}

void
velm_system_calls::set_protection_class(const char* path, int protection_class) const
{
    int fd = ::open(path, O_RDONLY | O_CLOEXEC);
    if (fd < 0)
        return;
#ifdef F_SETPROTECTIONCLASS
    (void)fcntl(fd, F_SETPROTECTIONCLASS, protection_class);
#else
    // No data-protection classes on this platform: nothing to set, and the
    // open and close still show whether the directory is there.
    (void)protection_class;
#endif
    (void)::close(fd);
}

static const velm_system_calls real_calls{};
static const velm_system_calls* calls_in_use = &real_calls;

const velm_system_calls&
system_calls()
{
    return *calls_in_use;
}

void
use_system_calls(const velm_system_calls& calls)
{
    calls_in_use = &calls;
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

} // namespace velm_fs
