// SPDX-License-Identifier: Apache-2.0
// In-process: the version parse's fields, range errors and order, which no
// end-to-end row can reach; and the two hand-written matchers against
// std::regex with their own patterns, on every text up to the length where
// each group has met each neighbour, over the bytes at the edges of the
// patterns' ranges.
#include "dataset/icu.h"
#include "support/version.h"

#include <gtest/gtest.h>
#include <regex>

namespace {

const std::string many_a(1000000, 'a');

// A text, and the fields it leaves over the version 1999zz.5.6; "?" first
// when it warns (it does not parse: every field back to its default), "!"
// when it throws out_of_range (the fields as it leaves them).
const std::pair<std::string, std::string> parses[] = {
    {"2023c.1.2", "2023 c 1 2"},
    {"02023ab.007", "2023 ab 7 -1"},
    {"2147483647a.0", "2147483647 a 0 -1"},
    {"1" + many_a + ".1.0", "1 " + many_a + " 1 0"},
    {"2023c.1.0.5", "? -1  -1 -1"},
    {"2147483648a", "! 1999 zz 5 6"},
    {"99999999999999999999z", "! 1999 zz 5 6"},
    {"2023c.99999999999", "! 2023 c 5 6"},
    {"2023c.1.2147483648", "! 2023 c 1 6"}};

TEST(version, parse)
{
    for (const auto& [text, expected] : parses) {
        velm_version v(std::string("1999zz.5.6"));
        testing::internal::CaptureStderr();
        bool range = false;
        try {
            velm_version_parse(v, text);
        } catch (const std::out_of_range&) {
            range = true;
        }
        std::string warned = testing::internal::GetCapturedStderr().empty() ? "" : "? ";
        EXPECT_EQ(warned + (range ? "! " : "") + std::to_string(v.year) + " " + v.letters + " " +
                      std::to_string(v.minor1) + " " + std::to_string(v.minor2),
                  expected)
            << text;
    }
}

// Each first version is newer than the second, and not the reverse; "" is
// a version in the default state. Then pairs that are equal.
const char* const newer[][2] = {
    {"2024a", "2023z"},          {"2023d.1.0", "2023c.1.0"},
    {"2023ca", "2023c"},         {"2023z", "2023aa"},
    {"2023c.1", "2023c"},        {"2023c.0", "2023c"},
    {"2023c.10.0", "2023c.2.0"}, {"2023c.1.0", "2023c.1"},
    {"2023c.1.1", "2023c.1.0"},  {"0a", ""},
    {"2024a", "2023zzzz.99.99"},
};
const char* const equal[][2] = {
    {"2023c.1.0", "2023c.1.0"}, {"", ""}, {"02023c.01.00", "2023c.1.0"}};

TEST(version, order)
{
    auto version = [](const std::string& t) {
        return t.empty() ? velm_version() : velm_version(t);
    };
    for (const auto& [a, b] : newer) {
        EXPECT_TRUE(version(a) > version(b)) << a << " " << b;
        EXPECT_FALSE(version(b) > version(a) || version(a) == version(b)) << a << " " << b;
    }
    for (const auto& [a, b] : equal)
        EXPECT_TRUE(version(a) == version(b) && !(version(a) > version(b))) << a << " " << b;
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

// Then names of up to five pieces, and the longest a directory holds.
TEST(match, against_the_patterns)
{
    const std::regex version_text("([0-9]+)([a-z]+)(?:\\.([0-9]+))?(?:\\.([0-9]+))?"),
        icu_data_name("icutz([0-9]+[lbe])\\.dat");
    std::smatch expected;
    for (const std::string& text : texts({"0", "9", "a", "z", "A", ".", " ", "\n", "\x80"}, 6)) {
        bool matched = std::regex_match(text, expected, version_text);
        velm_version_match match = velm_version_match_text(text);
        ASSERT_EQ(match.size, matched ? 5U : 0U) << text;
        for (size_t group = 0; matched && group < 5; ++group)
            ASSERT_EQ(match.group[group], expected[group].str()) << text;
    }
    std::vector<std::string> names =
        texts({"icutz", "x", "0", "9", "l", "b", "e", "L", ".", "dat", "DAT", ".dat"}, 5);
    names.push_back("icutz" + std::string(245, '7') + "e.dat");
    for (const std::string& name : names) {
        bool matched = std::regex_match(name, expected, icu_data_name);
        ASSERT_EQ(velm_icu_schema_in_name(name), matched ? expected[1].str() : "") << name;
    }
}

} // namespace
