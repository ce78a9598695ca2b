// SPDX-License-Identifier: Apache-2.0
#include "driver/localtime.h"

#include "support/fs.h"
#include "support/prefix.h"

#include <err.h>

static const char localtime_link[] = "/var/db/timezone/localtime";
static const char live_prefix[] = "/var/db/timezone/zoneinfo";
static const char legacy_prefix[] = "/usr/share/zoneinfo";
static const char default_zone[] = "America/Los_Angeles";
static const char default_target[] = "/var/db/timezone/zoneinfo/America/Los_Angeles";

// True when the link is fine as it is or has been rewritten; false when it
// has to be reset. Any failure on the way also means a reset.
static bool
keep_or_rewrite_localtime()
{
    try {
        std::string target = velm_fs::read_symlink(localtime_link);
        if (has_prefix(target, live_prefix))
            return true;
        if (!has_prefix(target, legacy_prefix))
            return false;
        std::string corrected = live_prefix + target.substr(sizeof legacy_prefix - 1);
        warn("Correcting localtime link to %s", corrected.c_str());
        if (!velm_fs::path_exists(corrected))
            return false;
        (void)system_calls().remove(localtime_link);
        velm_fs::create_symlink(corrected, localtime_link);
        return true;
    } catch (...) {
        return false;
    }
}

void
correct_localtime_symlink()
{
    if (keep_or_rewrite_localtime())
        return;
    warn("localtime link invalid; resetting to %s", default_zone);
    (void)system_calls().remove(localtime_link);
    velm_fs::create_symlink(default_target, localtime_link);
}
