// Runs the rows of tests/tool.rows: the real tzlinks binary on a sample
// device tree in the sandbox, with its exact standard error, exit status
// and every entry it changes. Before it, tzlinks-status reads the same
// tree, from inside and through --root on a copy: both reports must be the
// same, change nothing, and foretell under next_boot what tzlinks then
// does, as a report of the tree afterwards shows it.
#include "harness.h"

#include <gtest/gtest.h>
#include <regex>

void
PrintTo(const row& r, std::ostream* os)
{
    *os << r.name;
}

namespace {

// What a JSON report holds between the first from and the next to.
std::string
between(const std::string& report, const std::string& from, const std::string& to)
{
    size_t at = report.find(from) + from.size();
    return report.substr(at, report.find(to, at) - at);
}

// The health, then the ids of the findings, of a JSON report.
std::string
health(const std::string& report)
{
    std::string found = between(report, "\"health\":\"", "\""), separator = ":";
    const std::regex id("\"id\":\"([^\"]*)\"");
    for (std::sregex_iterator m(report.begin(), report.end(), id), end; m != end; ++m)
        found += separator + (*m)[1].str(), separator = ",";
    return found;
}

class tool : public ::testing::TestWithParam<row> {};

TEST_P(tool, row)
{
    const row& r = GetParam();
    if (!sandbox_refused.empty())
        GTEST_SKIP() << "needs a private mount namespace: " << sandbox_refused;
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(build_tree("system_dataset 2023c 44l\n" + r.tree)) << r.tree;
    auto before = snapshot(true), plain_before = snapshot();
    std::string report = run(program(TZLINKS_STATUS_BINARY, {"--json"})).out;
    EXPECT_EQ(snapshot(true), before) << "tzlinks-status changed the tree";
    EXPECT_EQ(between(report, "\"action\":\"", "\"") + ":" + health(report), r.health);
    char copy[] = "/tmp/tzlinks-root.XXXXXX";
    ASSERT_TRUE(mkdtemp(copy) != nullptr);
    run({"sh", "-c", "mkdir $0/usr && cp -a /var $0 && cp -a /usr/share $0/usr", copy});
    outcome through_root = run(program(TZLINKS_STATUS_BINARY, {"--json", "--root", copy}));
    EXPECT_EQ(through_root.out, report) << "the report differs through --root";
    char health_ = r.health.at(r.health.find(':') + 1); // h, d or b
    EXPECT_EQ(through_root.status, health_ == 'h' ? 0 : health_ == 'd' ? 1 : 2);

    outcome run_ = run(tzlinks(r.inject));
    EXPECT_EQ(run_.err, r.err);
    EXPECT_EQ(run_.status, r.exit);
    EXPECT_EQ(run_.out, "");
    EXPECT_EQ(changes(plain_before, snapshot()), r.changes);
    const std::string record = "/var/db/timezone/TZVersionDiffRecord";
    bool written = snapshot(true)[record] != before[record];
    std::string after = run(program(TZLINKS_STATUS_BINARY, {"--json"})).out, messages;
    for (size_t at = 0, end; (end = run_.err.find('\n', at)) != std::string::npos; at = end + 1) {
        std::string line = run_.err.substr(at, end - at);
        messages += (messages.empty() ? "\"" : ",\"") +
                    std::regex_replace(line, std::regex("[\"\\\\]"), "\\$&") + "\"";
    }
    std::string next = between(report, "\"next_boot\":{", "},\"findings\"");
    if (r.inject.empty()) { // what strace does, nothing can foresee
        EXPECT_EQ(next.substr(next.find("\"zoneinfo\"")),
                  between(after, "{", ",\"tz_latest\"") + ",\"record\":" +
                      (written ? between(after, "\"record\":", ",\"localtime_zone\"") : "null") +
                      ",\"exit_status\":" + std::to_string(run_.status) + ",\"messages\":[" +
                      messages + "]");
    }
    if (getenv("TZLINKS_FAULTS") != nullptr && r.inject.empty())
        try_faults(copy + std::string("/var"));
    run({"rm", "-rf", copy});
}

std::string
row_name(const ::testing::TestParamInfo<row>& info)
{
    return info.param.name;
}

INSTANTIATE_TEST_SUITE_P(tzlinks, tool, ::testing::ValuesIn(load_rows()), row_name);

// tzlinks-status's command line; and the bytes of a name that are not
// UTF-8, or are control characters, as \udcHH and \u00HH in JSON and as
// \xHH in text.
TEST(status, command_line)
{
    const std::string usage = "usage: tzlinks-status [--json] [--root DIR]\n"
                              "       tzlinks-status --help | --version\n";
    const std::tuple<std::vector<std::string>, int, std::string, std::string> uses[] = {
        {{"--help"}, 0, usage + "Reports which time-zone data a device uses", ""},
        {{"--version"}, 0, "tzlinks-status " TZLINKS_VERSION "\n", ""},
        {{"-x"}, 64, "", "tzlinks-status: unknown argument: -x\n" + usage},
        {{"--json", "--root"}, 64, "", "tzlinks-status: missing directory after: --root\n" + usage},
        {{"--root=/no"}, 66, "", "tzlinks-status: cannot read /no: No such file or directory\n"},
        {{"--root", "/dev/null"},
         66,
         "",
         "tzlinks-status: cannot read /dev/null: Not a directory\n"},
    };
    for (const auto& [args, status, out, err] : uses) {
        outcome o = run(program(TZLINKS_STATUS_BINARY, args));
        EXPECT_EQ(std::to_string(o.status) + o.out.substr(0, out.size()) + o.err,
                  std::to_string(status) + out + err);
        EXPECT_EQ(o.out.empty(), out.empty());
    }
    if (!sandbox_refused.empty())
        GTEST_SKIP() << "needs a private mount namespace: " << sandbox_refused;
    ASSERT_TRUE(fresh_tree());
    // Valid sequences of one to four bytes, and the first and last of
    // each length; overlong forms, surrogates, beyond U+10FFFF, a lead
    // byte without its continuation, a continuation alone, control
    // characters, a sequence cut short by the end.
    ASSERT_TRUE(build_tree(
        "system_dataset 2023c 44l; live_system\n"
        "relink tz_latest \"$(printf "
        "'/x/a/\\303\\251/\\302\\200/\\337\\277/\\301\\277/\\340\\240\\200/\\340\\237\\277/"
        "\\355\\237\\277/\\355\\240\\200/\\357\\277\\277/\\360\\220\\200\\200/\\360\\217\\277\\277/"
        "\\364\\217\\277\\277/\\364\\220\\200\\200/\\365\\200/\\342\\202/\\200/\\001\\177/"
        "\\360\\237\\230')\""));
    std::string words;
    for (const std::string& word : program(TZLINKS_STATUS_BINARY))
        words += word + " ";
    outcome full = run({"sh", "-c", words + ">/dev/full"});
    EXPECT_EQ(std::to_string(full.status) + full.err,
              "74tzlinks-status: cannot write the report: No space left on device\n");
    EXPECT_NE(
        run(program(TZLINKS_STATUS_BINARY))
            .out.find("  tz_latest -> "
                      "/x/a/\xc3\xa9/\xc2\x80/\xdf\xbf/\\xc1\\xbf/\xe0\xa0\x80/\\xe0\\x9f\\xbf/"
                      "\xed\x9f\xbf/\\xed\\xa0\\x80/\xef\xbf\xbf/\xf0\x90\x80\x80/"
                      "\\xf0\\x8f\\xbf\\xbf/\xf4\x8f\xbf\xbf/\\xf4\\x90\\x80\\x80/\\xf5\\x80/"
                      "\\xe2\\x82/\\x80/\\x01\\x7f/\\xf0\\x9f\\x98\n"),
        std::string::npos);
    EXPECT_NE(run(program(TZLINKS_STATUS_BINARY, {"--json"}))
                  .out.find("\"tz_latest\":\"/x/a/\xc3\xa9/\xc2\x80/\xdf\xbf/\\udcc1\\udcbf/"
                            "\xe0\xa0\x80/\\udce0\\udc9f\\udcbf/\xed\x9f\xbf/\\udced\\udca0\\udc80/"
                            "\xef\xbf\xbf/\xf0\x90\x80\x80/\\udcf0\\udc8f\\udcbf\\udcbf/"
                            "\xf4\x8f\xbf\xbf/\\udcf4\\udc90\\udc80\\udc80/\\udcf5\\udc80/"
                            "\\udce2\\udc82/\\udc80/\\u0001\x7f/\\udcf0\\udc9f\\udc98\""),
              std::string::npos);
}

} // namespace
