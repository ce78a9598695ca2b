// SPDX-License-Identifier: Apache-2.0
// One tzlinks-update at a time changes a device: a lock on a file in the
// link directory, held until the program ends, that names its holder.
#include "update/update.h"

#include "support/paths.h"

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <ctime>
#include <err.h>
#include <fcntl.h>
#include <string>
#include <sys/file.h>
#include <unistd.h>

int
take_lock(const velm_device& device, int seconds)
{
    std::string path = device.at(velm_path::link_directory) + "/.tzlinks-update.lock";
    // Left open, and so held, until the program ends.
    int fd = open(path.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0644);
    if (fd < 0) {
        warn("cannot lock %s", path.c_str());
        return 74;
    }
    const timespec tenth = {0, 100000000};
    for (int tenths = 0; flock(fd, LOCK_EX | LOCK_NB) != 0; ++tenths) {
        if (errno != EWOULDBLOCK) {
            warn("cannot lock %s", path.c_str());
            return 74;
        }
        if (tenths >= seconds * 10) {
            char holder[32] = "";
            ssize_t n = pread(fd, holder, sizeof holder - 1, 0);
            holder[std::max(n, ssize_t(0))] = '\0';
            warnx("%s is held by process %ld: gave up after %d s", path.c_str(),
                  strtol(holder, nullptr, 10), seconds);
            return 75;
        }
        (void)nanosleep(&tenth, nullptr);
    }
    std::string pid = std::to_string(getpid()) + "\n";
    if (ftruncate(fd, 0) != 0 || pwrite(fd, pid.data(), pid.size(), 0) < 0)
        warn("cannot name this process in %s", path.c_str());
    return 0;
}
