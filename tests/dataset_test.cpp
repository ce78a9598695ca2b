// Datasets and their components on sample trees in the sandbox.
#include "dataset/dataset.h"
#include "dataset/icu.h"
#include "dataset/zoneinfo.h"
#include "outcome.h"
#include "sandbox.h"

#include <cerrno>
#include <dirent.h>

namespace {

class dataset_call : public sandbox_test, public ::testing::WithParamInterface<call_row> {};

TEST_P(dataset_call, behaves_as_listed)
{
    check_call_row(GetParam());
}

const char sys[] = "system_dataset 2023c 44l; ";
const char tz[] = "/var/db/timezone/tz/";

std::string
fields(const velm_version& v)
{
    return std::to_string(v.year) + " " + v.letters + " " + std::to_string(v.minor1) + " " +
           std::to_string(v.minor2);
}

// "<version string> = <fields> | <tz database dir> | <ICU dir>"
std::string
summary(const std::string& root)
{
    velm_dataset dataset(root);
    const auto& parts = dataset.get_components();
    return dataset.get_version_string() + " = " + fields(dataset.get_version()) + " | " +
           dynamic_cast<const velm_zoneinfo&>(*parts.at(0)).get_data_dir() + " | " +
           dynamic_cast<const velm_icu&>(*parts.at(1)).get_data_dir();
}

std::string
path_from_link(const std::string& target)
{
    return dataset_path_from_zoneinfo_link(target);
}

const std::string long_name(1500, 'a');

const call_row link_rows[] = {
    {"system", "", [] { return path_from_link("/usr/share/zoneinfo.default"); }, "", {}, ""},
    {"update",
     "",
     [] { return path_from_link("/var/db/timezone/tz/2023c.1.0/zoneinfo"); },
     "/var/db/timezone/tz/2023c.1.0",
     {},
     ""},
    {"trailing_slash",
     "",
     [] { return path_from_link("/var/db/timezone/tz/2023c.1.0/"); },
     "/var/db/timezone/tz/2023c.1.0",
     {},
     ""},
    {"nested",
     "",
     [] { return path_from_link("/var/db/timezone/tz/a/b/zoneinfo"); },
     "/var/db/timezone/tz/a/b",
     {},
     ""},
    {"doubled_slash",
     "",
     [] { return path_from_link("/var/db/timezone/tz/x//zoneinfo"); },
     "/var/db/timezone/tz/x/",
     {},
     ""},
    {"no_slash_after_prefix",
     "",
     [] { return path_from_link("/var/db/timezone/tz/2023c.1.0"); },
     "",
     {{"Bad zoneinfo link /var/db/timezone/tz/2023c.1.0", 0}},
     "int -1"},
    {"slash_right_after_prefix",
     "",
     [] { return path_from_link("/var/db/timezone/tz//zoneinfo"); },
     "",
     {{"Bad zoneinfo link /var/db/timezone/tz//zoneinfo", 0}},
     "int -1"},
    {"bare_prefix",
     "",
     [] { return path_from_link("/var/db/timezone/tz/"); },
     "",
     {{"Bad zoneinfo link /var/db/timezone/tz/", 0}},
     "int -1"},
    {"empty", "", [] { return path_from_link(""); }, "", {{"Bad zoneinfo link ", 0}}, "int -1"},
    {"host_zoneinfo",
     "",
     [] { return path_from_link("/usr/share/zoneinfo"); },
     "",
     {{"Bad zoneinfo link /usr/share/zoneinfo", 0}},
     "int -1"},
    {"system_trailing_slash",
     "",
     [] { return path_from_link("/usr/share/zoneinfo.default/"); },
     "",
     {{"Bad zoneinfo link /usr/share/zoneinfo.default/", 0}},
     "int -1"},
    {"relative",
     "",
     [] { return path_from_link("tz/2023c.1.0/zoneinfo"); },
     "",
     {{"Bad zoneinfo link tz/2023c.1.0/zoneinfo", 0}},
     "int -1"},
    {"missing_link", "", current_dataset_path, "", {{"Bad zoneinfo link ", ENOENT}}, "int -1"},
    {"link_read_back",
     "put_link /var/db/timezone/tz/2024a/zoneinfo /var/db/timezone/zoneinfo",
     current_dataset_path,
     "/var/db/timezone/tz/2024a",
     {},
     ""},
    // Cut to 1024 bytes, the target no longer has a '/' after the prefix.
    {"over_long_link_is_cut",
     "put_link /var/db/timezone/tz/" + long_name + "/zoneinfo /var/db/timezone/zoneinfo",
     current_dataset_path,
     "",
     {{"Bad zoneinfo link /var/db/timezone/tz/" + long_name.substr(0, 1004), 0}},
     "int -1"},
    {"zoneinfo_not_a_link",
     "put_file /var/db/timezone/zoneinfo x",
     current_dataset_path,
     "",
     {{"read_symlink: /var/db/timezone/zoneinfo", EINVAL}},
     "int 22"},
    {"no_latest", "", latest_dataset_path, "", {}, ""},
    {"latest_unchecked",
     "put_link ../x/ /var/db/timezone/tz_latest",
     latest_dataset_path,
     "../x/",
     {},
     ""},
};

INSTANTIATE_TEST_SUITE_P(link, dataset_call, ::testing::ValuesIn(link_rows),
                         [](const auto& row) { return row.param.name; });

const call_row root_rows[] = {
    {"update",
     "update_dataset 2023c.1.0 44l",
     [] { return summary("/var/db/timezone/tz/2023c.1.0"); },
     "2023c.1.0 = 2023 c 1 0 | /var/db/timezone/tz/2023c.1.0/zoneinfo | "
     "/var/db/timezone/tz/2023c.1.0/icutz",
     {},
     ""},
    {"no_dotted_numbers",
     "update_dataset 2023c 44l",
     [] { return summary("/var/db/timezone/tz/2023c"); },
     "2023c = 2023 c -1 -1 | /var/db/timezone/tz/2023c/zoneinfo | /var/db/timezone/tz/2023c/icutz",
     {},
     ""},
    {"trailing_slash",
     "update_dataset 2023c.1.0 44l",
     [] { return summary("/var/db/timezone/tz/2023c.1.0/"); },
     "2023c.1.0/ = -1  -1 -1 | /var/db/timezone/tz/2023c.1.0//zoneinfo | "
     "/var/db/timezone/tz/2023c.1.0//icutz",
     {{"Cannot parse version string 2023c.1.0/, results.size() = 0", 0},
      {"Cannot parse version string 2023c.1.0/", 0}},
     ""},
    {"missing_update_is_built",
     "",
     [] { return summary("/var/db/timezone/tz/2024a"); },
     "2024a = 2024 a -1 -1 | /var/db/timezone/tz/2024a/zoneinfo | /var/db/timezone/tz/2024a/icutz",
     {{"No ICU schema found for /var/db/timezone/tz/2024a", 0}},
     ""},
    {"system",
     sys,
     [] { return summary(""); },
     "2023c.1.0 = 2023 c 1 0 | /usr/share/zoneinfo.default | /usr/share/icu",
     {},
     ""},
    {"system_without_version",
     "",
     [] { return summary(""); },
     ".1.0 = -1  -1 -1 | /usr/share/zoneinfo.default | /usr/share/icu",
     {{"Cannot parse version string .1.0, results.size() = 0", ENOENT},
      {"Cannot parse version string .1.0", ENOENT}},
     ""},
    {"bare_prefix",
     "",
     [] { return summary(tz); },
     "",
     {{"velm_dataset::create_components: bad path /var/db/timezone/tz/", ENOENT}},
     "invalid_argument: badpath"},
    {"19_characters",
     "",
     [] { return summary("/var/db/timezone/tz"); },
     "",
     {{"velm_dataset::create_components: bad path /var/db/timezone/tz", ENOENT}},
     "invalid_argument: badpath"},
    {"tzz",
     "",
     [] { return summary("/var/db/timezone/tzz/2023c"); },
     "",
     {{"velm_dataset::create_components: bad path /var/db/timezone/tzz/2023c", ENOENT}},
     "invalid_argument: badpath"},
    {"relative",
     "",
     [] { return summary("tz/2023c"); },
     "",
     {{"velm_dataset::create_components: bad path tz/2023c", ENOENT}},
     "invalid_argument: badpath"},
    {"number_out_of_range",
     "",
     [] { return summary("/var/db/timezone/tz/2023c.99999999999"); },
     "",
     {},
     "out_of_range"},
};

INSTANTIATE_TEST_SUITE_P(root, dataset_call, ::testing::ValuesIn(root_rows),
                         [](const auto& row) { return row.param.name; });

// The first word of +VERSION and of icutzformat.txt, read the same way.
std::string
first_words()
{
    return velm_zoneinfo().get_version_text() + "|" + velm_icu().get_schema();
}

std::string
both_files(const std::string& text)
{
    return "put_file /usr/share/zoneinfo.default/+VERSION '" + text +
           "'; put_file /usr/share/icu/icutzformat.txt '" + text + "'";
}

const call_row word_rows[] = {
    {"word_and_newline", both_files("2023c\n"), first_words, "2023c|2023c", {}, ""},
    {"blanks_then_words",
     both_files("\n \t\n  2023c more text\n"),
     first_words,
     "2023c|2023c",
     {},
     ""},
    {"no_line_end", both_files("44l"), first_words, "44l|44l", {}, ""},
    {"all_c_white_space", both_files("\v\f\r 2024a\v"), first_words, "2024a|2024a", {}, ""},
    {"high_bytes_kept",
     both_files("\xc3\xa9t\xc3\xa9 x"),
     first_words,
     "\xc3\xa9t\xc3\xa9|\xc3\xa9t\xc3\xa9",
     {},
     ""},
    {"empty", both_files(""), first_words, "|", {}, ""},
    {"blank_only", both_files(" \n\t\n"), first_words, "|", {}, ""},
    {"missing", "", first_words, "|", {}, ""},
    {"directory",
     "mkdir -p /usr/share/zoneinfo.default/+VERSION /usr/share/icu/icutzformat.txt",
     first_words,
     "|",
     {},
     ""},
    {"huge_word",
     "head -c 3000000 /dev/zero | tr '\\0' 7 > /tmp/w; mkdir -p /usr/share/icu; "
     "cp /tmp/w /usr/share/icu/icutzformat.txt; rm /tmp/w",
     [] { return std::to_string(velm_icu().get_schema().size()); },
     "3000000",
     {},
     ""},
};

INSTANTIATE_TEST_SUITE_P(word, dataset_call, ::testing::ValuesIn(word_rows),
                         [](const auto& row) { return row.param.name; });

// The schema an update's ICU directory yields.
std::string
update_schema()
{
    return velm_icu("/var/db/timezone/tz/u").get_schema();
}

std::string
in_icu_dir(const std::string& commands)
{
    return "mkdir -p /var/db/timezone/tz/u/icutz; cd /var/db/timezone/tz/u/icutz; " + commands;
}

// The walk leaves errno at 0 when it runs out of entries.
const warned no_schema = {"No ICU schema found for /var/db/timezone/tz/u", 0};

const call_row icu_rows[] = {
    {"l", in_icu_dir("touch icutz44l.dat"), update_schema, "44l", {}, ""},
    {"b", in_icu_dir("touch icutz0b.dat"), update_schema, "0b", {}, ""},
    {"e_long_number",
     in_icu_dir("touch icutz1234567890e.dat"),
     update_schema,
     "1234567890e",
     {},
     ""},
    {"others_read_only",
     in_icu_dir("touch icutz44l.dat; chmod 004 icutz44l.dat"),
     update_schema,
     "44l",
     {},
     ""},
    {"among_odd_names",
     in_icu_dir("touch ' ' '\\' '-' 'a\nb' icutz44l.dat .icutz44b.dat"),
     update_schema,
     "44l",
     {},
     ""},
    {"upper_case",
     in_icu_dir("touch icutz44L.dat icutz44l.DAT"),
     update_schema,
     "",
     {no_schema},
     ""},
    {"two_letters", in_icu_dir("touch icutz44le.dat"), update_schema, "", {no_schema}, ""},
    {"no_digit", in_icu_dir("touch icutzl.dat"), update_schema, "", {no_schema}, ""},
    {"other_letter", in_icu_dir("touch icutz44x.dat"), update_schema, "", {no_schema}, ""},
    {"prefixed", in_icu_dir("touch xicutz44l.dat"), update_schema, "", {no_schema}, ""},
    {"suffixed",
     in_icu_dir("touch icutz44l.dat.bak icutz44l_dat"),
     update_schema,
     "",
     {no_schema},
     ""},
    {"not_readable_by_others",
     in_icu_dir("touch icutz44l.dat; chmod 640 icutz44l.dat"),
     update_schema,
     "",
     {no_schema},
     ""},
    {"symbolic_link",
     in_icu_dir("touch ../real; ln -s ../real icutz44l.dat"),
     update_schema,
     "",
     {no_schema},
     ""},
    {"in_subdirectory",
     in_icu_dir("mkdir sub; touch sub/icutz44l.dat"),
     update_schema,
     "",
     {no_schema},
     ""},
    {"directory", in_icu_dir("mkdir icutz44l.dat"), update_schema, "", {no_schema}, ""},
    {"empty_dir", in_icu_dir(""), update_schema, "", {no_schema}, ""},
    {"missing_dir", "", update_schema, "", {no_schema}, ""},
    {"icu_dir_is_a_file",
     "put_file /var/db/timezone/tz/u/icutz x",
     update_schema,
     "",
     {no_schema},
     ""},
    {"hundred_thousand_entries",
     in_icu_dir("seq 100000 | sed 's/^/f/' | xargs touch; touch icutz7b.dat"),
     update_schema,
     "7b",
     {},
     ""},
};

INSTANTIATE_TEST_SUITE_P(icu, dataset_call, ::testing::ValuesIn(icu_rows),
                         [](const auto& row) { return row.param.name; });

// Several matches: the walk returns the directory's order, and the first
// match in that order wins.
TEST_F(sandbox_test, first_icu_match_in_directory_order_wins)
{
    build_tree(in_icu_dir("touch icutz1l.dat icutz2b.dat icutz3e.dat"));
    std::string first;
    DIR* dir = opendir("/var/db/timezone/tz/u/icutz");
    ASSERT_NE(dir, nullptr);
    while (const dirent* entry = readdir(dir)) {
        std::string name = entry->d_name;
        if (first.empty() && name.rfind("icutz", 0) == 0)
            first = name.substr(5, name.size() - 9);
    }
    closedir(dir);
    EXPECT_EQ(update_schema(), first);
}

} // namespace

namespace {

// Answers a fixed compatible_schema and counts how often it was asked.
class fake_component final : public velm_dataset_component {
  public:
    explicit fake_component(bool yes) : answer(yes) {}
    bool compatible_schema(const velm_dataset_component&) const override
    {
        ++asked;
        return answer;
    }
    void activate() const override {}
    bool answer;
    mutable int asked = 0;
};

// "<result> <times each of mine was asked>", e.g. "false 1 0".
std::string
compare_lists(std::vector<bool> mine, size_t theirs)
{
    velm_component_list a, b;
    std::vector<std::shared_ptr<fake_component>> fakes;
    for (bool answer : mine) {
        fakes.push_back(std::make_shared<fake_component>(answer));
        a.push_back(fakes.back());
    }
    for (size_t i = 0; i < theirs; ++i)
        b.push_back(std::make_shared<fake_component>(true));
    std::string result = compatible_components(a, b) ? "true" : "false";
    for (const auto& fake : fakes)
        result += " " + std::to_string(fake->asked);
    return result;
}

std::string
icu_compatible()
{
    velm_icu system, update("/var/db/timezone/tz/u");
    errno = 0;
    return update.compatible_schema(system) ? "true" : "false";
}

std::string
links()
{
    return describe("/var/db/timezone/zoneinfo") + ", " + describe("/var/db/timezone/icutz") +
           ", " + describe("/var/db/icutz");
}

template <class T>
std::string
activated(const std::string& root)
{
    T(root).activate();
    return links();
}

std::string
forced()
{
    force_system_dataset();
    return links();
}

const std::string u = "/var/db/timezone/tz/u";
const char old_links[] = "mkdir -p /var/db/timezone; put_link /x /var/db/timezone/zoneinfo; "
                         "put_link /y /var/db/timezone/icutz; put_link /z /var/db/icutz";

const call_row compatible_rows[] = {
    {"both_empty", "", [] { return compare_lists({}, 0); }, "true", {}, ""},
    {"one_empty", "", [] { return compare_lists({}, 2); }, "false", {}, ""},
    {"other_empty", "", [] { return compare_lists({true}, 0); }, "false 0", {}, ""},
    {"longer_other",
     "",
     [] {
         return compare_lists({true, true}, 3);
     },
     "false 1 1",
     {},
     ""},
    {"shorter_other",
     "",
     [] {
         return compare_lists({true, true, true}, 2);
     },
     "false 1 1 0",
     {},
     ""},
    {"first_no_stops",
     "",
     [] {
         return compare_lists({false, true}, 2);
     },
     "false 1 0",
     {},
     ""},
    {"all_agree",
     "",
     [] {
         return compare_lists({true, true}, 2);
     },
     "true 1 1",
     {},
     ""},
    {"same_schema",
     "put_file /usr/share/icu/icutzformat.txt 44l; update_dataset u 44l",
     icu_compatible,
     "true",
     {},
     ""},
    {"schema_case_differs",
     "put_file /usr/share/icu/icutzformat.txt 44L; update_dataset u 44l",
     icu_compatible,
     "false",
     {},
     ""},
    {"other_schema",
     "put_file /usr/share/icu/icutzformat.txt 44l; update_dataset u 46l",
     icu_compatible,
     "false",
     {},
     ""},
    {"both_empty_schemas", "", icu_compatible, "true", {{"No ICU schema found for " + u, 0}}, ""},
    {"update_without_schema",
     "put_file /usr/share/icu/icutzformat.txt 44l",
     icu_compatible,
     "false",
     {{"No ICU schema found for " + u, 0}},
     ""},
    {"zoneinfo_as_other",
     "",
     [] { return velm_icu().compatible_schema(velm_zoneinfo()) ? "true" : "false"; },
     "false",
     {{"velm_icu::compatible_schema: could not dynamic_cast other component", ENOENT}},
     ""},
    {"zoneinfo_agrees_with_icu",
     "",
     [] { return velm_zoneinfo().compatible_schema(velm_icu()) ? "true" : "false"; },
     "true",
     {},
     ""},
};

INSTANTIATE_TEST_SUITE_P(compatible, dataset_call, ::testing::ValuesIn(compatible_rows),
                         [](const auto& row) { return row.param.name; });

const call_row activate_rows[] = {
    {"zoneinfo_fresh",
     "mkdir -p /var/db/timezone",
     [] { return activated<velm_zoneinfo>(u); },
     "-> " + u + "/zoneinfo, absent, absent",
     {},
     ""},
    {"zoneinfo_replaces",
     old_links,
     [] { return activated<velm_zoneinfo>(""); },
     "-> /usr/share/zoneinfo.default, -> /y, -> /z",
     {},
     ""},
    {"zoneinfo_twice",
     "mkdir -p /var/db/timezone",
     [] {
         velm_zoneinfo(u).activate();
         return activated<velm_zoneinfo>(u);
     },
     "-> " + u + "/zoneinfo, absent, absent",
     {},
     ""},
    {"zoneinfo_over_directory",
     "mkdir -p /var/db/timezone/zoneinfo/x",
     [] { return activated<velm_zoneinfo>(u); },
     "",
     {{"remove: could not remove /var/db/timezone/zoneinfo", EISDIR},
      {"Unlink of zoneinfo symlink failed", EISDIR},
      {"create_symlink: from /var/db/timezone/zoneinfo to " + u + "/zoneinfo", EEXIST}},
     "int 17",
     "/var/db/timezone/zoneinfo",
     "dir"},
    {"icu_update",
     old_links,
     [] { return activated<velm_icu>(u); },
     "-> /x, -> " + u + "/icutz, absent",
     {{"No ICU schema found for " + u, 0}},
     ""},
    {"icu_system_leaves_no_link",
     old_links,
     [] { return activated<velm_icu>(""); },
     "-> /x, absent, absent",
     {},
     ""},
    {"icu_over_directory",
     "mkdir -p /var/db/timezone/icutz; put_link /z /var/db/icutz",
     [] { return activated<velm_icu>(""); },
     "absent, dir, -> /z",
     {{"remove: could not remove /var/db/timezone/icutz", EISDIR},
      {"unlink of ICU softlink failed", EISDIR}},
     ""},
    {"icu_update_over_directory",
     "mkdir -p /var/db/timezone/icutz/x",
     [] { return activated<velm_icu>(u); },
     "",
     {{"No ICU schema found for " + u, 0},
      {"remove: could not remove /var/db/timezone/icutz", EISDIR},
      {"unlink of ICU softlink failed", EISDIR},
      {"create_symlink: from /var/db/timezone/icutz to " + u + "/icutz", EEXIST}},
     "int 17",
     "/var/db/timezone/icutz",
     "dir"},
    {"dataset_update",
     std::string(old_links) + "; update_dataset u 44l",
     [] {
         velm_dataset(u).activate();
         return links();
     },
     "-> " + u + "/zoneinfo, -> " + u + "/icutz, absent",
     {{"Cannot parse version string u, results.size() = 0", 0},
      {"Cannot parse version string u", 0}},
     ""},
    {"force_system",
     std::string(sys) + old_links,
     forced,
     "-> /usr/share/zoneinfo.default, absent, absent",
     {},
     ""},
    // Without /var/db/timezone the zoneinfo link cannot be made, and the
    // ICU component is never reached: the legacy link survives.
    {"force_system_without_directory",
     std::string(sys) + "rmdir /var/db/timezone/tz "
                        "/var/db/timezone; put_link /z "
                        "/var/db/icutz",
     forced,
     "",
     {{"create_symlink: from /var/db/timezone/zoneinfo to /usr/share/zoneinfo.default", ENOENT}},
     "int 2",
     "/var/db/icutz",
     "-> /z"},
};

INSTANTIATE_TEST_SUITE_P(activate, dataset_call, ::testing::ValuesIn(activate_rows),
                         [](const auto& row) { return row.param.name; });

} // namespace
