// SPDX-License-Identifier: Apache-2.0
#include "dataset/zoneinfo.h"

#include "dataset/first_word.h"
#include "support/fs.h"

#include "support/paths.h"

#include <err.h>

velm_zoneinfo::velm_zoneinfo(const std::string& root)
    : velm_dataset_component(root),
      data_dir(root.empty() ? velm_path::system_zoneinfo : root + "/zoneinfo")
{
    read_version();
}

void
velm_zoneinfo::read_version()
{
    // Only the system partition's version is ever used: an update's is
    // opened and read into, for what errno then says in the messages that
    // follow, but not held, however long it is.
    read_first_word(data_dir + "/+VERSION", version_text,
                    root_path.empty() ? std::string::npos : 0);
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
        velm_fs::remove(velm_path::zoneinfo_link);
    } catch (...) {
        warn("Unlink of zoneinfo symlink failed");
    }
    velm_fs::create_symlink(data_dir, velm_path::zoneinfo_link);
}
