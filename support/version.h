// The parsed form of a dataset version string such as 2023c.1.0, and the
// order that decides whether one dataset is newer than another.
#ifndef TZLINKS_SUPPORT_VERSION_H
#define TZLINKS_SUPPORT_VERSION_H

#include <cstdint>
#include <string>

struct velm_version {
    // -1 and empty mean "absent"; they order below every parsed value, so
    // a text that does not parse is older than any real version.
    int32_t year = -1;
    std::string letters;
    int32_t minor1 = -1;
    int32_t minor2 = -1;

    velm_version() = default;
    explicit velm_version(const std::string& text);

    bool operator>(const velm_version& other) const;
    bool operator==(const velm_version& other) const;
};

// Replaces all four fields from text. A text without the version form warns
// twice and leaves the default state; a number too large for int32_t throws
// std::out_of_range with no warning, possibly after year and letters were
// already replaced.
void velm_version_parse(velm_version& version, const std::string& text);

#endif
