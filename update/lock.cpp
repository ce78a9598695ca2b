// SPDX-License-Identifier: Apache-2.0
// One tzlinks-update at a time changes a device: a lock on a file in the
// link directory, held until the program ends.
#include "update/update.h"

#include "support/paths.h"

#include <cerrno>
#include <err.h>
#include <fcntl.h>
#include <time.h>
#include <unistd.h>

int
take_lock(const velm_device& device, int seconds)
{
    std::string path = device.at(velm_path::link_directory) + "/.tzlinks-update.lock";
    // Left open: closing any descriptor of the file would let the lock go.
    int fd = open(path.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0600);
    if (fd < 0) {
        warn("cannot lock %s", path.c_str());
        return 74;
    }
    struct flock lock = {};
    lock.l_type = F_WRLCK, lock.l_whence = SEEK_SET;
    const timespec tenth = {0, 100000000};
    for (int tenths = 0;; ++tenths) {
        if (fcntl(fd, F_SETLK, &lock) == 0)
            return 0;
        if (errno != EACCES && errno != EAGAIN) {
            warn("cannot lock %s", path.c_str());
            return 74;
        }
        if (tenths >= seconds * 10)
            break;
        (void)nanosleep(&tenth, nullptr);
    }
    struct flock held = lock;
    if (fcntl(fd, F_GETLK, &held) != 0 || held.l_type == F_UNLCK)
        held.l_pid = 0;
    warnx("%s is held by process %d: gave up after %d s", path.c_str(), held.l_pid, seconds);
    return 75;
}
