// The two hand-written matchers against std::regex with their patterns: on
// every text up to the length where each group has met each of its
// neighbours, over the bytes at the edges of the patterns' ranges, and on
// the longest names a directory can hold.
#include "dataset/icu.h"
#include "support/version.h"

#include <gtest/gtest.h>
#include <regex>

namespace {

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
