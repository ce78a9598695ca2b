// SPDX-License-Identifier: Apache-2.0
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

// What a whole-text match of ([0-9]+)([a-z]+)(?:\.([0-9]+))?(?:\.([0-9]+))?
// yields: size is the number of sub-matches, 0 when the text does not
// match and 5 when it does; group[0] is the whole text, group[1] to [4]
// year, letters and the two dotted numbers, empty when absent.
struct velm_version_match {
    size_t size = 0;
    std::string group[5];
};
velm_version_match velm_version_match_text(const std::string& text);

// Replaces all four fields from text. A text without the version form warns
// twice and leaves the default state; a number too large for int32_t throws
// std::out_of_range with no warning, possibly after year and letters were
// already replaced.
void velm_version_parse(velm_version& version, const std::string& text);

#endif
