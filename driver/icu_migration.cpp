// SPDX-License-Identifier: Apache-2.0
#include "driver/housekeeping.h"

#include "support/fs.h"

#include <err.h>

static const char old_icu_link[] = "/var/db/icutz";
static const char new_icu_link[] = "/var/db/timezone/icutz";

void
migrate_icu_link()
{
    // The target is copied as it stands: a relative target is then read
    // relative to /var/db/timezone/.
    try {
        if (velm_fs::path_exists(old_icu_link) && !velm_fs::path_exists(new_icu_link))
            velm_fs::create_symlink(velm_fs::read_symlink(old_icu_link), new_icu_link);
    } catch (...) {
        warn("Could not migrate /var/db/icutz to /var/db/timezone/icutz");
    }
    // Deleted whenever it still resolves, whether or not it was copied.
    try {
        if (velm_fs::path_exists(old_icu_link))
            velm_fs::remove(old_icu_link);
    } catch (...) {
        warn("Could not remove /var/db/icutz");
    }
}
