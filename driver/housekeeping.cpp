// SPDX-License-Identifier: Apache-2.0
#include "driver/housekeeping.h"

#include "support/fs.h"
#include "support/paths.h"

#include <err.h>
#include <fcntl.h>
#include <string>
#include <unistd.h>

// Class D: accessible at any time, including before first unlock, which is
// when this tool and the readers of its links run.
static const int protection_class_d = 4;

// Silent on every failure: a directory that is missing or cannot be opened
// simply keeps the class it has.
static void
set_protection_class(const std::string& path)
{
    int fd = system_calls().open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0)
        return;
#ifdef F_SETPROTECTIONCLASS
    (void)fcntl(fd, F_SETPROTECTIONCLASS, protection_class_d);
#else
    // No data-protection classes on this platform: nothing to set; the open
    // and close are all that is left of the call.
    (void)protection_class_d;
#endif
    (void)close(fd);
}

void
protect_data_directories()
{
    set_protection_class(velm_path::link_directory_slash);
    set_protection_class(velm_path::updates);
}

void
migrate_icu_link()
{
    // The target is copied as it stands: a relative target is then read
    // relative to /var/db/timezone/.
    try {
        if (velm_fs::path_exists(velm_path::legacy_icu_link) &&
            !velm_fs::path_exists(velm_path::icutz_link))
            velm_fs::create_symlink(velm_fs::read_symlink(velm_path::legacy_icu_link),
                                    velm_path::icutz_link);
    } catch (...) {
        warn("Could not migrate /var/db/icutz to /var/db/timezone/icutz");
    }
    // Deleted whenever it still resolves, whether or not it was copied.
    try {
        if (velm_fs::path_exists(velm_path::legacy_icu_link))
            velm_fs::remove(velm_path::legacy_icu_link);
    } catch (...) {
        warn("Could not remove /var/db/icutz");
    }
}
