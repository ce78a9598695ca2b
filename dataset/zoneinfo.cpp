// SPDX-License-Identifier: Apache-2.0
#include "dataset/zoneinfo.h"

#include "dataset/first_word.h"
#include "support/fs.h"

#include <err.h>

static const char system_zoneinfo_dir[] = "/usr/share/zoneinfo.default";
static const char zoneinfo_link[] = "/var/db/timezone/zoneinfo";

velm_zoneinfo::velm_zoneinfo() : velm_zoneinfo(std::string()) {}

velm_zoneinfo::velm_zoneinfo(const std::string& root)
    : velm_dataset_component(root),
      data_dir(root.empty() ? system_zoneinfo_dir : root + "/zoneinfo")
{
    read_version();
}

void
velm_zoneinfo::read_version()
{
    read_first_word(data_dir + "/+VERSION", version_text);
}

bool
velm_zoneinfo::compatible_schema(const velm_dataset_component& /*other*/) const
{
    return true;
}

void
velm_zoneinfo::activate() const
{
    // A stale entry that cannot be removed is worth a warning, not giving
    // up: the creation below fails on its own if the name is still taken.
    try {
        velm_fs::remove(zoneinfo_link);
    } catch (...) {
        warn("Unlink of zoneinfo symlink failed");
    }
    velm_fs::create_symlink(data_dir, zoneinfo_link);
}
