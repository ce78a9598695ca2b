// SPDX-License-Identifier: Apache-2.0
#include "dataset/dataset.h"

#include "dataset/icu.h"
#include "dataset/zoneinfo.h"
#include "support/fs.h"
#include "support/paths.h"
#include "support/prefix.h"

#include <err.h>
#include <stdexcept>

static const char* const update_prefix = velm_path::updates;
static const size_t update_prefix_length = sizeof velm_path::updates - 1;

velm_dataset::velm_dataset()
{
    create_components();
}

velm_dataset::velm_dataset(const std::string& root) : root_path(root)
{
    create_components();
}

void
velm_dataset::create_components()
{
    // The zoneinfo component comes first, even before the root is checked:
    // the system dataset takes its version from it.
    auto zoneinfo = std::make_shared<velm_zoneinfo>(root_path);
    if (root_path.empty()) {
        version_string = velm_release_version(zoneinfo->get_version_text());
    } else if (root_path.size() > update_prefix_length && has_prefix(root_path, update_prefix)) {
        version_string = root_path.substr(update_prefix_length);
    } else {
        warn("velm_dataset::create_components: bad path %s", root_path.c_str());
        throw std::invalid_argument("badpath");
    }
    velm_version_parse(version, version_string);
    components.push_back(zoneinfo);
    components.push_back(std::make_shared<velm_icu>(root_path));
}

// Pairwise compatible_schema over two lists, stopping at the first "no";
// lists of different lengths are never compatible.
static bool
compatible_components(const velm_component_list& mine, const velm_component_list& theirs)
{
    size_t i = 0;
    for (; i < mine.size() && i < theirs.size(); ++i) {
        if (!mine[i]->compatible_schema(*theirs[i]))
            return false;
    }
    return i == mine.size() && i == theirs.size();
}

bool
velm_dataset::compatible(const velm_dataset& other) const
{
    return compatible_components(components, other.components);
}

bool
velm_dataset::operator>(const velm_dataset& other) const
{
    return version > other.version;
}

void
velm_dataset::activate() const
{
    for (const auto& component : components)
        component->activate();
}

std::string
velm_release_version(const std::string& release)
{
    return release + ".1.0";
}

void
force_system_dataset()
{
    velm_dataset system;
    system.activate();
}

std::string
latest_dataset_path()
{
    return velm_fs::read_symlink(velm_path::latest_link);
}

// Turns a zoneinfo link target back into a dataset root: the link points
// at <root>/zoneinfo for an update, so the root is all before the last '/';
// that '/' must leave a non-empty name after the prefix. Warns and throws
// -1 for a target that names neither an update nor the system partition.
static std::string
dataset_path_from_zoneinfo_link(const std::string& target)
{
    if (target.size() > update_prefix_length && has_prefix(target, update_prefix)) {
        size_t last_slash = target.rfind('/');
        if (last_slash > update_prefix_length)
            return target.substr(0, last_slash);
    } else if (target == velm_path::system_zoneinfo) {
        return std::string();
    }
    warn("Bad zoneinfo link %s", target.c_str());
    throw -1;
}

std::string
current_dataset_path()
{
    return dataset_path_from_zoneinfo_link(velm_fs::read_symlink(velm_path::zoneinfo_link));
}
