// Version parsing and ordering, as tables of texts.
#include "outcome.h"
#include "sandbox.h"
#include "support/version.h"

#include <cerrno>
#include <ostream>

namespace {

struct parse_row {
    std::string text;
    int year;
    std::string letters;
    int minor1;
    int minor2;
    bool warns;
};

const parse_row parse_rows[] = {
    {"2023c", 2023, "c", -1, -1, false},
    {"2023c.1", 2023, "c", 1, -1, false},
    {"2023c.1.0", 2023, "c", 1, 0, false},
    {"2023c.1.2", 2023, "c", 1, 2, false},
    {"02023ab.007", 2023, "ab", 7, -1, false},
    {"2147483647a", 2147483647, "a", -1, -1, false},
    {"0z.0.0", 0, "z", 0, 0, false},
    {"2023c.1.0.5", -1, "", -1, -1, true},
    {"2023C", -1, "", -1, -1, true},
    {"2023", -1, "", -1, -1, true},
    {"2023c.", -1, "", -1, -1, true},
    {"2023c..1", -1, "", -1, -1, true},
    {".", -1, "", -1, -1, true},
    {"2023c\n", -1, "", -1, -1, true},
    {" 2023c", -1, "", -1, -1, true},
    {"2023c ", -1, "", -1, -1, true},
    {"", -1, "", -1, -1, true},
    {"c2023", -1, "", -1, -1, true},
    {"2023c.1.0/", -1, "", -1, -1, true},
    {"a/b", -1, "", -1, -1, true},
    {"2023\xe9", -1, "", -1, -1, true},
};

void
PrintTo(const parse_row& row, std::ostream* os)
{
    *os << ::testing::PrintToString(row.text);
}

class version_parse : public ::testing::TestWithParam<parse_row> {};

// Starts from a parsed version so that a failed parse visibly resets every
// field, letters included.
TEST_P(version_parse, fields_and_warnings)
{
    const parse_row& row = GetParam();
    velm_version version(std::string("1999zz.5.6"));
    errno = 0;
    outcome seen = observe([&] { velm_version_parse(version, row.text); });
    EXPECT_EQ(seen.thrown, "");
    EXPECT_EQ(version.year, row.year);
    EXPECT_EQ(version.letters, row.letters);
    EXPECT_EQ(version.minor1, row.minor1);
    EXPECT_EQ(version.minor2, row.minor2);
    std::string expected;
    if (row.warns)
        expected = warning("Cannot parse version string " + row.text + ", results.size() = 0", 0) +
                   warning("Cannot parse version string " + row.text, 0);
    EXPECT_EQ(seen.err, expected);
}

INSTANTIATE_TEST_SUITE_P(version, version_parse, ::testing::ValuesIn(parse_rows));

// A number beyond int32_t escapes without a word, leaving whatever fields
// were assigned before it.
struct range_row {
    std::string text;
    int year;
    std::string letters;
    int minor1;
};

const range_row range_rows[] = {
    {"2147483648a", 1999, "zz", 5},
    {"99999999999999999999z", 1999, "zz", 5},
    {"2023c.99999999999", 2023, "c", 5},
    {"2023c.1.2147483648", 2023, "c", 1},
};

void
PrintTo(const range_row& row, std::ostream* os)
{
    *os << row.text;
}

class version_range : public ::testing::TestWithParam<range_row> {};

TEST_P(version_range, escapes_silently_part_assigned)
{
    const range_row& row = GetParam();
    velm_version version(std::string("1999zz.5.6"));
    outcome seen = observe([&] { velm_version_parse(version, row.text); });
    EXPECT_EQ(seen.thrown, "out_of_range");
    EXPECT_EQ(seen.err, "");
    EXPECT_EQ(version.year, row.year);
    EXPECT_EQ(version.letters, row.letters);
    EXPECT_EQ(version.minor1, row.minor1);
    EXPECT_EQ(version.minor2, 6);
}

INSTANTIATE_TEST_SUITE_P(version, version_range, ::testing::ValuesIn(range_rows));

TEST(version, construction_from_text_lets_range_error_escape)
{
    EXPECT_THROW(velm_version(std::string("2147483648a")), std::out_of_range);
}

// "" stands for a version in the default state.
velm_version
parsed(const std::string& text)
{
    velm_version version;
    if (!text.empty())
        observe([&] { velm_version_parse(version, text); });
    return version;
}

struct order_row {
    std::string newer;
    std::string older;
};

const order_row order_rows[] = {
    {"2024a", "2023z"},
    {"2023d.1.0", "2023c.1.0"},
    {"2023ca", "2023c"},
    {"2023z", "2023aa"},
    {"2023c.1", "2023c"},
    {"2023c.0", "2023c"},
    {"2023c.10.0", "2023c.2.0"},
    {"2023c.1.0", "2023c.1"},
    {"2023c.1.1", "2023c.1.0"},
    {"1999a", ""},
    {"0a", ""},
    {"2024a", "2023zzzz.99.99"},
};

void
PrintTo(const order_row& row, std::ostream* os)
{
    *os << '"' << row.newer << "\" \"" << row.older << '"';
}

class version_order : public ::testing::TestWithParam<order_row> {};

TEST_P(version_order, newer_is_greater_one_way_only)
{
    velm_version newer = parsed(GetParam().newer);
    velm_version older = parsed(GetParam().older);
    EXPECT_TRUE(newer > older);
    EXPECT_FALSE(older > newer);
    EXPECT_FALSE(newer == older);
}

INSTANTIATE_TEST_SUITE_P(version, version_order, ::testing::ValuesIn(order_rows));

class version_equal : public ::testing::TestWithParam<order_row> {};

TEST_P(version_equal, neither_greater)
{
    velm_version a = parsed(GetParam().newer);
    velm_version b = parsed(GetParam().older);
    EXPECT_FALSE(a > b);
    EXPECT_FALSE(b > a);
    EXPECT_TRUE(a == b);
}

const order_row equal_rows[] = {
    {"2023c.1.0", "2023c.1.0"},   {"", ""},      {"02023c", "2023c"},
    {"2023c.01.00", "2023c.1.0"}, {"2023C", ""},
};

INSTANTIATE_TEST_SUITE_P(version, version_equal, ::testing::ValuesIn(equal_rows));

// Letters compare as unsigned bytes; a parsed version never holds such a
// byte, but the order must not depend on char being signed.
TEST(version, letters_compare_as_unsigned_bytes)
{
    velm_version high = parsed("2023a");
    velm_version low = high;
    high.letters = "\xe9";
    EXPECT_TRUE(high > low);
    EXPECT_FALSE(low > high);
}

} // namespace
