// SPDX-License-Identifier: Apache-2.0
#include "driver/localtime.h"

#include "support/fs.h"
#include "support/paths.h"
#include "support/prefix.h"

#include <err.h>

using velm_path::localtime_link;
// A link into the live tree is kept; one into the tree of older systems is
// moved into the live one.
static const char* const live_prefix = velm_path::zoneinfo_link;
static const char* const legacy_prefix = velm_path::legacy_zoneinfo;

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
        std::string corrected =
            std::string(live_prefix) + target.substr(sizeof velm_path::legacy_zoneinfo - 1);
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
    warn("localtime link invalid; resetting to %s", velm_path::default_zone);
    (void)system_calls().remove(localtime_link);
    velm_fs::create_symlink(velm_path::default_localtime, localtime_link);
}
