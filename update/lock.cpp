// SPDX-License-Identifier: Apache-2.0
// One tzlinks-update at a time changes a device: a record lock on a file in
// the link directory, held until the program ends. The kernel tells who
// holds it; nothing written into the file could be trusted so.
#include "update/tree.h"
#include "update/update.h"

#include "device/text.h"
#include "support/paths.h"

#include <cerrno>
#include <ctime>
#include <err.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sysexits.h>
#include <unistd.h>

static const char lock_name[] = ".tzlinks-update.lock";

// The lock file, opened; -1 when what stands there is no regular file.
static int
open_lock(int links)
{
    int fd = openat(links, lock_name, O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0644);
    struct stat st;
    if (fd >= 0 && (fstat(fd, &st) != 0 || !S_ISREG(st.st_mode))) {
        (void)close(fd);
        errno = EEXIST;
        return -1;
    }
    return fd;
}

int
take_lock(const velm_device& device, int links, int seconds, bool clear)
{
    std::string path =
        shown(device.named(velm_path::link_directory + std::string("/") + lock_name));
    int fd = open_lock(links);
    if (fd < 0 && clear && (errno == ELOOP || errno == EEXIST || errno == EISDIR)) {
        if (int error = remove_all(links, lock_name); error != 0)
            errno = error;
        else
            fd = open_lock(links);
    }
    if (fd < 0) {
        warn("cannot lock %s%s", path.c_str(),
             errno == ELOOP || errno == EEXIST || errno == EISDIR
                 ? " (no regular file: tzlinks-update prune clears it)"
                 : "");
        return EX_IOERR;
    }
    // Left open, and so held, until the program ends.
    struct flock lock = {};
    lock.l_type = F_WRLCK, lock.l_whence = SEEK_SET;
    const timespec tenth = {0, 100000000};
    for (int tenths = 0; fcntl(fd, F_SETLK, &lock) != 0; ++tenths) {
        if (errno != EACCES && errno != EAGAIN) {
            warn("cannot lock %s", path.c_str());
            return EX_IOERR;
        }
        if (tenths >= seconds * 10) {
            struct flock holder = lock;
            bool known =
                fcntl(fd, F_GETLK, &holder) == 0 && holder.l_type != F_UNLCK && holder.l_pid > 0;
            if (known)
                warnx("%s is held by process %ld: gave up after %d s", path.c_str(),
                      static_cast<long>(holder.l_pid), seconds);
            else
                warnx("%s is held by another process: gave up after %d s", path.c_str(), seconds);
            return EX_TEMPFAIL;
        }
        (void)nanosleep(&tenth, nullptr);
    }
    return 0;
}
