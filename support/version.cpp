// SPDX-License-Identifier: Apache-2.0
#include "support/version.h"

#include <cerrno>
#include <climits>
#include <err.h>
#include <stdexcept>

velm_version::velm_version(const std::string& text)
{
    velm_version_parse(*this, text);
}

// Where the run of bytes from first to last that begins at "at" ends.
static size_t
run_end(const std::string& text, size_t at, char first, char last)
{
    while (at < text.size() && text[at] >= first && text[at] <= last)
        ++at;
    return at;
}

// Every group is greedy and each is followed by something it cannot hold
// (digits by letters or '.', letters by '.' or the end), so taking the
// longest run each time finds the one way the text can match, if any. No
// recursion and no backtracking: a text of any length costs one pass.
velm_version_match
velm_version_match_text(const std::string& text)
{
    velm_version_match match;
    size_t letters = run_end(text, 0, '0', '9');
    size_t at = run_end(text, letters, 'a', 'z');
    if (letters == 0 || at == letters)
        return match;
    match.group[1] = text.substr(0, letters);
    match.group[2] = text.substr(letters, at - letters);
    for (int minor = 3; minor <= 4 && at < text.size() && text[at] == '.'; ++minor) {
        size_t end = run_end(text, at + 1, '0', '9');
        if (end == at + 1)
            return velm_version_match();
        match.group[minor] = text.substr(at + 1, end - at - 1);
        at = end;
    }
    if (at != text.size())
        return velm_version_match();
    match.group[0] = text;
    match.size = 5;
    return match;
}

// Decimal digits to a field, failing as the C++ library's stoi does, which
// the tool's messages have always followed: out_of_range beyond 32 bits,
// and errno set to ERANGE only when even a long cannot hold the number.
static int32_t
number(const std::string& digits)
{
    long value = 0;
    for (char digit : digits) {
        if (value > (LONG_MAX - (digit - '0')) / 10) {
            errno = ERANGE;
            throw std::out_of_range("stoi");
        }
        value = value * 10 + (digit - '0');
    }
    if (value > INT32_MAX)
        throw std::out_of_range("stoi");
    return static_cast<int32_t>(value);
}

void
velm_version_parse(velm_version& version, const std::string& text)
{
    velm_version_match results = velm_version_match_text(text);
    if (results.size != 5) {
        warn("Cannot parse version string %s, results.size() = %d", text.c_str(),
             static_cast<int>(results.size));
        warn("Cannot parse version string %s", text.c_str());
        version = velm_version();
        return;
    }
    // Assigned in this order: a number out of range leaves the fields
    // before it replaced.
    version.year = number(results.group[1]);
    version.letters = results.group[2];
    // An absent dotted number is -1, below every present one.
    version.minor1 = results.group[3].empty() ? -1 : number(results.group[3]);
    version.minor2 = results.group[4].empty() ? -1 : number(results.group[4]);
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
