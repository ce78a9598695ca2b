// SPDX-License-Identifier: Apache-2.0
#include "update/update.h"

#include "dataset/icu.h"
#include "support/version.h"

#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

// Reported entries that make an update unsafe; a tree can hold thousands.
const size_t most_unsafe = 8;

velm_finding
problem(const char* severity, const char* id, const std::string& subject,
        const std::string& message, const std::string& manual)
{
    velm_finding found;
    found.severity = severity, found.id = id, found.subject = subject;
    found.message = message, found.manual = manual;
    return found;
}

// Up to limit bytes of the regular file at path below dir, following
// links (SRC's links stay inside it); none when it is no such file.
std::optional<std::string>
start_of(int dir, const std::string& path, size_t limit)
{
    int fd = openat(dir, path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    struct stat st;
    std::optional<std::string> text;
    if (fd >= 0 && fstat(fd, &st) == 0 && S_ISREG(st.st_mode)) {
        text.emplace(limit, '\0');
        text->resize(static_cast<size_t>(std::max(pread(fd, text->data(), limit, 0), ssize_t(0))));
    }
    if (fd >= 0)
        (void)close(fd);
    return text;
}

// Whether a relative link target, read in the directory depth levels
// below the top, stays below the top all the way.
bool
stays_inside(const std::string& target, int depth)
{
    if (target.empty() || target[0] == '/')
        return false;
    for (size_t at = 0; at <= target.size();) {
        size_t end = std::min(target.find('/', at), target.size());
        std::string name = target.substr(at, end - at);
        depth += name == ".." ? -1 : name.empty() || name == "." ? 0 : 1;
        if (depth < 0)
            return false;
        at = end + 1;
    }
    return true;
}

// A link's target; "" when it cannot be read.
std::string
target_of(int dir, const std::string& name)
{
    char target[4096];
    ssize_t n = readlinkat(dir, name.c_str(), target, sizeof target);
    return n > 0 ? std::string(target, static_cast<size_t>(n)) : "";
}

// Walks the tree below dir (at: its path below SRC), never following a
// link: only directories, regular files it can read and relative links
// that stay inside SRC may be there.
void
walk(int dir, const std::string& at, int depth, const std::string& name,
     std::vector<velm_finding>& found, size_t& unsafe)
{
    int listing = dup(dir);
    DIR* entries = listing < 0 ? nullptr : fdopendir(listing);
    if (entries == nullptr) {
        if (listing >= 0)
            (void)close(listing);
        return;
    }
    rewinddir(entries); // a duplicate shares the position of a listing before
    // cppcheck-suppress readdirCalled ; one thread, one directory stream
    while (const struct dirent* entry = readdir(entries)) {
        std::string child = entry->d_name, path = at + "/" + child, why;
        if (child == "." || child == "..")
            continue;
        struct stat st;
        int fd = -1;
        if (fstatat(dir, child.c_str(), &st, AT_SYMLINK_NOFOLLOW) != 0)
            why = std::string("cannot be looked at: ") + strerror(errno);
        else if (S_ISLNK(st.st_mode) && !stays_inside(target_of(dir, child), depth))
            why = "is a link that leads out of it";
        else if (!S_ISLNK(st.st_mode) && !S_ISREG(st.st_mode) && !S_ISDIR(st.st_mode))
            why = S_ISFIFO(st.st_mode)   ? "is a FIFO"
                  : S_ISSOCK(st.st_mode) ? "is a socket"
                                         : "is a device";
        else if (!S_ISLNK(st.st_mode) &&
                 (fd = openat(dir, child.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC)) <
                     0)
            why = std::string("cannot be read: ") + strerror(errno);
        if (!why.empty() && unsafe++ < most_unsafe)
            found.push_back(problem("error", "source-unsafe", name + path,
                                    name + path + " " + why +
                                        ": an update holds only directories, regular files and "
                                        "relative links that stay inside it.",
                                    name + " without " + path.substr(1)));
        if (fd >= 0 && S_ISDIR(st.st_mode))
            walk(fd, path, depth + 1, name, found, unsafe);
        if (fd >= 0)
            (void)close(fd);
    }
    closedir(entries);
}

// The ICU data file the boot would find directly in icutz/: its name.
std::string
icu_data_in(int src)
{
    int fd = openat(src, "icutz", O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    DIR* entries = fd < 0 ? nullptr : fdopendir(fd);
    std::string found;
    // cppcheck-suppress readdirCalled ; one thread, one directory stream
    while (const struct dirent* entry = entries != nullptr ? readdir(entries) : nullptr) {
        struct stat st;
        if (!velm_icu_schema_in_name(entry->d_name).empty() &&
            fstatat(fd, entry->d_name, &st, AT_SYMLINK_NOFOLLOW) == 0 && S_ISREG(st.st_mode) &&
            (st.st_mode & S_IROTH) != 0 && found.empty())
            found = entry->d_name;
    }
    if (entries != nullptr)
        closedir(entries);
    else if (fd >= 0)
        (void)close(fd);
    return found;
}

} // namespace

std::string
source_release(int src)
{
    std::string text = start_of(src, "zoneinfo/+VERSION", 4096).value_or("");
    const char* spaces = " \t\n\v\f\r";
    size_t begin = std::min(text.find_first_not_of(spaces), text.size());
    return text.substr(begin, text.find_first_of(spaces, begin) - begin);
}

std::vector<velm_finding>
examine_source(int src, const std::string& name, const std::string& version,
               const std::string& zone)
{
    std::vector<velm_finding> found;
    velm_version_match match = velm_version_match_text(version);
    if (match.size != 5)
        found.push_back(problem("error", "source-not-a-version", name,
                                "\"" + version +
                                    "\" is not a version as the boot reads them "
                                    "(such as 2025b.1.0): no boot would adopt it.",
                                "--as with a version, such as 2025b.1.0"));
    struct stat st;
    std::string release = source_release(src);
    if (fstatat(src, "zoneinfo", &st, 0) != 0 || !S_ISDIR(st.st_mode))
        found.push_back(problem("error", "source-no-zoneinfo", name + "/zoneinfo",
                                name + "/zoneinfo is no directory: the update has no tz database.",
                                "the compiled tz database in " + name + "/zoneinfo"));
    else if (release.empty())
        found.push_back(problem("error", "source-no-release", name + "/zoneinfo/+VERSION",
                                name + "/zoneinfo/+VERSION names no release: what the update "
                                       "holds cannot be told.",
                                "the release, such as 2025b, as the first word of " + name +
                                    "/zoneinfo/+VERSION"));
    else if (match.size == 5 && release != match.group[1] + match.group[2])
        found.push_back(problem("error", "source-release-mismatch", name + "/zoneinfo/+VERSION",
                                "The update holds the tz database " + release + ", but " + version +
                                    " says " + match.group[1] + match.group[2] + ".",
                                "--as " + release + ".1.0, or the tz database of release " +
                                    match.group[1] + match.group[2]));
    std::string data = icu_data_in(src);
    std::string head = data.empty() ? "" : start_of(src, "icutz/" + data, 4).value_or("");
    if (data.empty())
        found.push_back(
            problem("error", "source-no-icu", name + "/icutz",
                    name + "/icutz holds no ICU data the boot can use: a regular "
                           "file icutz<schema>.dat, readable by others.",
                    "the update's ICU data, such as icutz44l.dat, in " + name + "/icutz"));
    else if (head.size() < 4 || head.compare(2, 2, "\xda\x27") != 0)
        found.push_back(problem("error", "source-icu-bad", name + "/icutz/" + data,
                                name + "/icutz/" + data +
                                    (head.empty() ? " is empty"
                                                  : " is no ICU data (it lacks the header ICU's "
                                                    "data files begin with)") +
                                    ": ICU's readers would fail.",
                                "ICU data built by ICU's tools as " + name + "/icutz/" + data));
    if (!zone.empty() && fstatat(src, "zoneinfo", &st, 0) == 0 && S_ISDIR(st.st_mode) &&
        start_of(src, "zoneinfo/" + zone, 4).value_or("").compare(0, 4, "TZif") != 0)
        found.push_back(problem("warning", "source-lacks-zone", name + "/zoneinfo/" + zone,
                                name + "/zoneinfo/" + zone +
                                    ", the device's zone, is no zone "
                                    "file: once it is in use, the "
                                    "device's localtime leads nowhere.",
                                "the zone " + zone + " in " + name + "/zoneinfo"));
    size_t unsafe = 0;
    walk(src, "", 0, name, found, unsafe);
    if (unsafe > most_unsafe)
        found.push_back(problem("error", "source-unsafe", name,
                                std::to_string(unsafe - most_unsafe) + " more entries of " + name +
                                    " are no directory, regular "
                                    "file or link inside it.",
                                name + " without them"));
    return found;
}
