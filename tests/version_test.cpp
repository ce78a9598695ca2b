// In-process: the version parse's worked cases, range errors and order
// (tests/version.rows), which no end-to-end row can reach; and the two
// hand-written matchers against std::regex with their own patterns, on
// every text up to the length where each group has met each neighbour,
// over the bytes at the edges of the patterns' ranges.
#include "dataset/icu.h"
#include "harness.h"
#include "support/version.h"

#include <fstream>
#include <gtest/gtest.h>
#include <regex>

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

TEST(version, rows)
{
    std::ifstream rows(TZLINKS_SOURCE_DIR "/tests/version.rows");
    for (std::string row; std::getline(rows, row);) {
        std::string line = row[0] == '=' ? " " + row : row; // the empty text
        size_t arrow = line.find(" => "), space = line.find(' ');
        SCOPED_TRACE(row);
        if (row.empty() || row[0] == '#') {
            continue;
        } else if (arrow == std::string::npos) { // A > B or A = B
            velm_version a = version_of(line.substr(0, space)),
                         b = version_of(line.substr(space + 3));
            EXPECT_EQ(a > b, line[space + 1] == '>');
            EXPECT_FALSE(b > a);
            EXPECT_EQ(a == b, line[space + 1] == '=');
            continue;
        }
        std::string text = unescape(line.substr(0, arrow)),
                    expected = unescape(line.substr(arrow + 4));
        velm_version version(std::string("1999zz.5.6"));
        std::string thrown, me = program_invocation_short_name;
        errno = 0;
        testing::internal::CaptureStderr();
        try {
            velm_version_parse(version, text);
        } catch (const std::out_of_range&) {
            thrown = "range ";
        }
        EXPECT_EQ(testing::internal::GetCapturedStderr(),
                  expected != "no" ? ""
                                   : me + ": Cannot parse version string " + text +
                                         ", results.size() = 0: Success\n" + me +
                                         ": Cannot parse version string " + text + ": Success\n");
        EXPECT_EQ(thrown + fields(version), expected == "no" ? "-1  -1 -1" : expected);
    }
}

// Every text of up to max bytes drawn from alphabet.
std::vector<std::string>
texts(const std::string& alphabet, size_t max)
{
    std::vector<std::string> all = {""};
    for (size_t i = 0; i < all.size() && all[i].size() < max; ++i) {
        for (char c : alphabet)
            all.push_back(all[i] + c);
    }
    return all;
}

TEST(match, version_text)
{
    const std::regex pattern("([0-9]+)([a-z]+)(?:\\.([0-9]+))?(?:\\.([0-9]+))?");
    for (const std::string& text : texts("09azA. \n\x80", 6)) {
        std::smatch expected;
        bool matched = std::regex_match(text, expected, pattern);
        velm_version_match match = velm_version_match_text(text);
        ASSERT_EQ(match.size, matched ? 5U : 0U) << text;
        for (size_t group = 0; matched && group < 5; ++group)
            ASSERT_EQ(match.group[group], expected[group].str()) << text;
    }
}

// Names between a few prefixes and suffixes, and the longest a directory
// holds.
TEST(match, icu_data_name)
{
    const std::regex pattern("icutz([0-9]+[lbe])\\.dat");
    std::vector<std::string> middles = texts("09lbeL.x", 4);
    middles.push_back(std::string(245, '7') + "e");
    for (const char* before : {"", "icutz", "icutZ", "xicutz", "icut"}) {
        for (const char* after : {"", ".dat", ".da", ".dat.", "xdat", ".DAT"}) {
            for (const std::string& middle : middles) {
                std::string name = before + middle + after;
                std::smatch expected;
                bool matched = std::regex_match(name, expected, pattern);
                ASSERT_EQ(velm_icu_schema_in_name(name), matched ? expected[1].str() : "") << name;
            }
        }
    }
}

} // namespace
