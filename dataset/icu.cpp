// SPDX-License-Identifier: Apache-2.0
#include "dataset/icu.h"

#include "dataset/first_word.h"
#include "support/fs.h"
#include "support/paths.h"
#include "support/prefix.h"

#include <cerrno>
#include <dirent.h>
#include <err.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

velm_icu::velm_icu(const std::string& root)
    : velm_dataset_component(root), data_dir(root.empty() ? velm_path::system_icu : root + "/icutz")
{
    initialize();
}

void
velm_icu::initialize()
{
    if (root_path.empty())
        read_first_word(data_dir + "/icutzformat.txt", schema);
    else
        find_update_schema();
}

std::string
velm_icu_schema_in_name(const std::string& name)
{
    static const size_t digits = sizeof "icutz" - 1;
    size_t letter = digits;
    while (letter < name.size() && name[letter] >= '0' && name[letter] <= '9')
        ++letter;
    if (!has_prefix(name, "icutz") || letter == digits || letter >= name.size() ||
        (name[letter] != 'l' && name[letter] != 'b' && name[letter] != 'e') ||
        name.compare(letter + 1, std::string::npos, ".dat") != 0)
        return std::string();
    return name.substr(digits, letter + 1 - digits);
}

// Only a regular file directly inside the directory, readable by others,
// counts; links, directories and whatever lies deeper do not. The first
// match in directory order wins.
static std::string
first_data_file_in(int directory, const std::string& path, std::string& schema)
{
    alignas(struct dirent64) char buffer[8192];
    ssize_t n;
    while ((n = getdents64(directory, buffer, sizeof buffer)) > 0) {
        for (ssize_t at = 0; at < n;) {
            const auto* entry = reinterpret_cast<const struct dirent64*>(buffer + at);
            at += entry->d_reclen;
            struct stat st;
            schema = velm_icu_schema_in_name(entry->d_name);
            if (schema.empty())
                continue;
            if (fstatat(directory, entry->d_name, &st, AT_SYMLINK_NOFOLLOW) != 0)
                system_calls().io_failed(path + "/" + entry->d_name, errno);
            else if (S_ISREG(st.st_mode) && (st.st_mode & S_IROTH) != 0)
                return entry->d_name;
        }
    }
    if (n < 0)
        system_calls().io_failed(path, errno);
    schema.clear();
    return std::string();
}

std::string
velm_icu_data_file(const std::string& directory, std::string* schema)
{
    std::string name, spelled;
    int fd =
        system_calls().open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_NONBLOCK | O_CLOEXEC);
    if (fd >= 0) {
        name = first_data_file_in(fd, directory, spelled);
        (void)close(fd);
    }
    if (schema != nullptr)
        *schema = spelled;
    return name;
}

// An update's schema is spelled in the name of its data file, for example
// icutz44l.dat. A missing or unreadable directory holds none.
void
velm_icu::find_update_schema()
{
    (void)velm_icu_data_file(data_dir, &schema);
    if (schema.empty()) {
        // A walk that finds nothing ends with errno at 0: this warning,
        // and those after it that follow no failed call, carry that text.
        errno = 0;
        warn("No ICU schema found for %s", root_path.c_str());
    }
}

bool
velm_icu::compatible_schema(const velm_dataset_component& other) const
{
    const auto* other_icu = dynamic_cast<const velm_icu*>(&other);
    if (other_icu == nullptr) {
        warn("velm_icu::compatible_schema: could not dynamic_cast other component");
        return false;
    }
    return schema == other_icu->schema;
}

void
velm_icu::activate() const
{
    try {
        velm_fs::remove(velm_path::icutz_link);
        velm_fs::remove(velm_path::legacy_icu_link);
    } catch (...) {
        warn("unlink of ICU softlink failed");
    }
    if (!root_path.empty())
        velm_fs::create_symlink(data_dir, velm_path::icutz_link);
}
