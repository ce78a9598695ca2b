// In-process: the version parse's fields, range errors and order
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

TEST(version, rows)
{
    std::ifstream rows(TZLINKS_SOURCE_DIR "/tests/version.rows");
    auto version = [](const std::string& text) {
        return text == "-" ? velm_version() : velm_version(unescape(text));
    };
    for (std::string row; std::getline(rows, row);) {
        size_t arrow = row.find(" => "), space = row.find(' ');
        SCOPED_TRACE(row);
        if (row[0] != '#' && arrow == std::string::npos) { // A > B, A = B
            velm_version a = version(row.substr(0, space)), b = version(row.substr(space + 3));
            EXPECT_EQ(a > b, row[space + 1] == '>');
            EXPECT_FALSE(b > a);
            EXPECT_EQ(a == b, row[space + 1] == '=');
        } else if (row[0] != '#') {
            std::string text = unescape(row.substr(0, arrow)),
                        expected = unescape(row.substr(arrow + 4));
            velm_version parsed(std::string("1999zz.5.6"));
            testing::internal::CaptureStderr();
            try {
                velm_version_parse(parsed, text);
            } catch (const std::out_of_range&) {
                expected.replace(0, 6, "");
            }
            std::string warned = testing::internal::GetCapturedStderr();
            EXPECT_EQ(warned.empty(), expected != "no");
            EXPECT_EQ(fields(parsed), expected == "no" ? "-1  -1 -1" : expected);
        }
    }
}

// Every text of up to max pieces.
std::vector<std::string>
texts(const std::vector<std::string>& pieces, size_t max)
{
    std::vector<std::string> all = {""};
    for (size_t begin = 0, level = 0; level < max; ++level) {
        size_t end = all.size();
        for (size_t i = begin; i < end; ++i) {
            for (const std::string& piece : pieces)
                all.push_back(all[i] + piece);
        }
        begin = end;
    }
    return all;
}

TEST(match, version_text)
{
    const std::regex pattern("([0-9]+)([a-z]+)(?:\\.([0-9]+))?(?:\\.([0-9]+))?");
    for (const std::string& text : texts({"0", "9", "a", "z", "A", ".", " ", "\n", "\x80"}, 6)) {
        std::smatch expected;
        bool matched = std::regex_match(text, expected, pattern);
        velm_version_match match = velm_version_match_text(text);
        ASSERT_EQ(match.size, matched ? 5U : 0U) << text;
        for (size_t group = 0; matched && group < 5; ++group)
            ASSERT_EQ(match.group[group], expected[group].str()) << text;
    }
}

// Names of up to five pieces, and the longest a directory holds.
TEST(match, icu_data_name)
{
    const std::regex pattern("icutz([0-9]+[lbe])\\.dat");
    std::vector<std::string> names =
        texts({"icutz", "x", "0", "9", "l", "b", "e", "L", ".", "dat", "DAT", ".dat"}, 5);
    names.push_back("icutz" + std::string(245, '7') + "e.dat");
    for (const std::string& name : names) {
        std::smatch expected;
        bool matched = std::regex_match(name, expected, pattern);
        ASSERT_EQ(velm_icu_schema_in_name(name), matched ? expected[1].str() : "") << name;
    }
}

} // namespace
