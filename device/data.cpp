// SPDX-License-Identifier: Apache-2.0
#include "device/data.h"

#include "dataset/first_word.h"
#include "dataset/icu.h"
#include "support/paths.h"
#include "support/prefix.h"

#include <algorithm>
#include <cerrno>

std::string
velm_update_of(const std::string& path)
{
    static const size_t prefix = sizeof velm_path::updates - 1;
    if (path.size() <= prefix || !has_prefix(path, velm_path::updates) || path[prefix] == '/')
        return "";
    return path.substr(0, path.find('/', prefix));
}

std::string
velm_update_at(velm_simulation& tree, const std::string& path, bool follow)
{
    std::string updates = tree.where(velm_path::updates, true) + "/", at = tree.where(path, follow);
    if (!has_prefix(at, updates.c_str()) || at.size() == updates.size())
        return "";
    size_t end = std::min(at.find('/', updates.size()), at.size());
    return velm_path::updates + at.substr(updates.size(), end - updates.size());
}

std::set<std::string>
velm_named_updates(velm_simulation& tree, std::string* unread)
{
    std::set<std::string> named;
    for (const char* link :
         {velm_path::zoneinfo_link, velm_path::icutz_link, velm_path::latest_link}) {
        velm_entry entry = tree.look(link);
        named.insert(velm_update_of(entry.kind == velm_entry::link ? entry.text : ""));
        named.insert(velm_update_at(tree, link));
    }
    named.erase("");
    // A loop of links names nothing; any other failure could hide a name.
    for (const auto& [path, error] : tree.unread()) {
        if (unread != nullptr && error != ELOOP && error != ENAMETOOLONG && error != EFBIG)
            *unread = path;
    }
    return named;
}

std::string
velm_first_word(velm_simulation& tree, const std::string& path)
{
    velm_calls_in_use simulated(tree);
    std::string word;
    read_first_word(path, word);
    return word;
}

std::string
velm_icu_file(velm_simulation& tree, const std::string& directory)
{
    velm_calls_in_use simulated(tree);
    std::string name = velm_icu_data_file(directory);
    return name.empty() ? "" : directory + "/" + name;
}

bool
velm_zone_file(velm_simulation& tree, const std::string& path)
{
    return tree.read(path, 4) == "TZif";
}

bool
velm_icu_data(velm_simulation& tree, const std::string& path)
{
    std::string head = tree.read(path, 4).value_or("");
    return head.size() == 4 && head.compare(2, 2, "\xda\x27") == 0;
}
