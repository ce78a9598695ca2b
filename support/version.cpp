#include "support/version.h"

#include <err.h>
#include <regex>
#include <stdexcept>

velm_version::velm_version(const std::string& text)
{
    velm_version_parse(*this, text);
}

// An absent dotted number comes out of the match as empty text; stoi
// rejects that with invalid_argument, which here simply means "absent".
// Out-of-range is deliberately left to escape.
static int32_t
optional_number(const std::string& digits)
{
    try {
        return std::stoi(digits);
    } catch (const std::invalid_argument&) {
        return -1;
    }
}

void
velm_version_parse(velm_version& version, const std::string& text)
{
    // Compiled on every call: a run parses one text per dataset it builds.
    // The system's +VERSION word has no length limit, and the default
    // backtracking matcher recurses once per character: a damaged file of a
    // few tens of kilobytes would overflow the stack. The library's
    // breadth-first matcher finds the same whole match in constant stack,
    // and the pattern is unambiguous, so the groups come out the same.
    const std::regex pattern("([0-9]+)([a-z]+)(?:\\.([0-9]+))?(?:\\.([0-9]+))?",
                             std::regex::ECMAScript | std::regex_constants::__polynomial);
    std::smatch results;
    try {
        if (!std::regex_match(text, results, pattern) || results.size() != 5) {
            warn("Cannot parse version string %s, results.size() = %d", text.c_str(),
                 static_cast<int>(results.size()));
            throw std::invalid_argument("no match");
        }
        version.year = std::stoi(results[1].str());
        version.letters = results[2].str();
    } catch (const std::invalid_argument&) {
        warn("Cannot parse version string %s", text.c_str());
        version = velm_version();
        return;
    }
    version.minor1 = optional_number(results[3].str());
    version.minor2 = optional_number(results[4].str());
}

bool
velm_version::operator>(const velm_version& other) const
{
    if (year != other.year)
        return year > other.year;
    // std::string compares as unsigned bytes; a longer string with a common
    // prefix is the greater one.
    int letters_order = letters.compare(other.letters);
    if (letters_order != 0)
        return letters_order > 0;
    if (minor1 != other.minor1)
        return minor1 > other.minor1;
    return minor2 > other.minor2;
}

bool
velm_version::operator==(const velm_version& other) const
{
    return year == other.year && letters == other.letters && minor1 == other.minor1 &&
           minor2 == other.minor2;
}
