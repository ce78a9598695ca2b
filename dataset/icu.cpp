#include "dataset/icu.h"

#include "dataset/first_word.h"
#include "support/fs.h"

#include <cerrno>
#include <cstring>
#include <err.h>
#include <fts.h>
#include <regex>
#include <sys/stat.h>

static const char system_icu_dir[] = "/usr/share/icu";
static const char icu_link[] = "/var/db/timezone/icutz";
static const char legacy_icu_link[] = "/var/db/icutz";

velm_icu::velm_icu() : velm_icu(std::string()) {}

velm_icu::velm_icu(const std::string& root)
    : velm_dataset_component(root), data_dir(root.empty() ? system_icu_dir : root + "/icutz")
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

// Only a readable regular file directly inside data_dir counts; anything
// else the walk returns (the root itself, deeper entries, links, entries
// that could not be stat'ed) is passed over.
static bool
is_candidate(const FTSENT* entry)
{
    return entry->fts_errno == 0 && entry->fts_level == 1 && entry->fts_namelen != 0 &&
           entry->fts_info == FTS_F && (entry->fts_statp->st_mode & S_IROTH) != 0;
}

// An update's schema is spelled in the name of its data file, for example
// icutz44l.dat. The first match in directory order wins.
void
velm_icu::find_update_schema()
{
    const std::regex pattern("icutz([0-9]+[lbe])\\.dat", std::regex::ECMAScript);
    char* roots[] = {const_cast<char*>(data_dir.c_str()), nullptr};
    FTS* walk = fts_open(roots, FTS_COMFOLLOW | FTS_PHYSICAL | FTS_XDEV, nullptr);
    if (walk == nullptr) {
        warn("tz_icu::initialize: fts_open of %s failed, %s", data_dir.c_str(), strerror(errno));
        throw errno;
    }
    while (const FTSENT* entry = fts_read(walk)) {
        if (!schema.empty())
            break;
        if (!is_candidate(entry))
            continue;
        std::cmatch match;
        if (std::regex_match(entry->fts_name, match, pattern) && match.size() == 2)
            schema = match[1].str();
    }
    fts_close(walk);
    if (schema.empty())
        warn("No ICU schema found for %s", root_path.c_str());
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
        velm_fs::remove(icu_link);
        velm_fs::remove(legacy_icu_link);
    } catch (...) {
        warn("unlink of ICU softlink failed");
    }
    if (!root_path.empty())
        velm_fs::create_symlink(data_dir, icu_link);
}
