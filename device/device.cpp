// SPDX-License-Identifier: Apache-2.0
#include "device/device.h"

#include "device/simulation.h"

#include <cerrno>
#include <climits>
#include <cstdlib>
#include <err.h>
#include <fcntl.h>
#include <sysexits.h>
#include <unistd.h>

std::string
velm_device::real(const std::string& path) const
{
    size_t slash = path.rfind('/');
    velm_simulation tree(fd);
    std::string canonical;
    if (root.empty() || slash == 0 || slash == std::string::npos ||
        tree.look(path.substr(0, slash), true, &canonical).kind != velm_entry::directory)
        return path;
    return canonical + path.substr(slash);
}

int
velm_device::open_directory(const std::string& path, std::string* real) const
{
    velm_simulation tree(fd);
    std::string canonical;
    velm_entry entry = tree.look(path, true, &canonical);
    if (entry.kind != velm_entry::directory) {
        errno = entry.error != 0                   ? entry.error
                : entry.kind == velm_entry::absent ? ENOENT
                                                   : ENOTDIR;
        return -1;
    }
    if (real != nullptr)
        *real = root + canonical;
    int directory = openat(fd, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    for (size_t at = 1; at < canonical.size();) {
        if (directory < 0)
            return -1;
        size_t end = std::min(canonical.find('/', at), canonical.size());
        int next = openat(directory, canonical.substr(at, end - at).c_str(),
                          O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
        int error = errno;
        (void)close(directory);
        directory = next, errno = error, at = end + 1;
    }
    return directory;
}

int
open_device(const char* dir, velm_device& device)
{
    device.fd = open(dir != nullptr ? dir : "/", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (device.fd < 0) {
        warn("cannot read %s", dir != nullptr ? dir : "/");
        return EX_NOINPUT;
    }
    if (dir == nullptr)
        return 0;
    velm_simulation tree(device.fd);
    if (tree.look("/var", true).kind != velm_entry::directory ||
        tree.look("/usr/share", true).kind != velm_entry::directory) {
        warnx("%s holds no device tree: it lacks var/ or usr/share/", dir);
        return EX_NOINPUT;
    }
    // Commands name the tree's paths below DIR by its real path, however
    // DIR was given.
    char real[PATH_MAX];
    device.root = realpath(dir, real) != nullptr ? real : dir;
    if (device.root == "/")
        device.root.clear();
    return 0;
}
