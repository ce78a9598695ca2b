// The version parse's worked cases and range errors, and the order, from
// tests/version.rows; these are the cases no end-to-end row can reach.
#include "rows.h"
#include "support/version.h"

#include <cerrno>
#include <fstream>
#include <gtest/gtest.h>
#include <stdexcept>

namespace {

std::string
fields(const velm_version& v)
{
    return std::to_string(v.year) + " " + v.letters + " " + std::to_string(v.minor1) + " " +
           std::to_string(v.minor2);
}

velm_version
version_of(const std::string& text)
{
    return text == "-" ? velm_version() : velm_version(unescape(text));
}

void
check(const std::string& row)
{
    SCOPED_TRACE(row);
    std::string line = row[0] == '=' ? " " + row : row; // the empty text
    size_t at = line.find(" => ");
    if (at == std::string::npos) { // an order row
        size_t space = line.find(' ');
        velm_version a = version_of(line.substr(0, space)), b = version_of(line.substr(space + 3));
        bool newer = line[space + 1] == '>';
        EXPECT_EQ(a > b, newer);
        EXPECT_FALSE(b > a);
        EXPECT_EQ(a == b, !newer);
        return;
    }
    std::string text = unescape(line.substr(0, at)), expected = unescape(line.substr(at + 4));
    velm_version version(std::string("1999zz.5.6"));
    std::string warnings, thrown;
    errno = 0;
    testing::internal::CaptureStderr();
    try {
        velm_version_parse(version, text);
    } catch (const std::out_of_range&) {
        thrown = "range ";
    }
    warnings = testing::internal::GetCapturedStderr();
    if (expected == "no") {
        std::string me = program_invocation_short_name;
        EXPECT_EQ(warnings, me + ": Cannot parse version string " + text +
                                ", results.size() = 0: Success\n" + me +
                                ": Cannot parse version string " + text + ": Success\n");
        expected = "-1  -1 -1";
    } else {
        EXPECT_EQ(warnings, "");
    }
    EXPECT_EQ(thrown + fields(version), expected);
}

TEST(version, rows)
{
    std::ifstream rows(TZLINKS_SOURCE_DIR "/tests/version.rows");
    for (std::string line; std::getline(rows, line);) {
        if (!line.empty() && line[0] != '#')
            check(line);
    }
}

} // namespace
