// Runs the rows of tests/tool.rows: the real tzlinks binary on a sample
// device tree in the sandbox, with its exact standard error, exit status
// and every entry it changes. Before it, tzlinks-status reads the same
// tree, from inside and through --root on a copy: both reports must be the
// same, change nothing, and foretell exactly what tzlinks then does.
#include "harness.h"

#include <cstring>
#include <gtest/gtest.h>

void
PrintTo(const row& r, std::ostream* os)
{
    *os << r.name;
}

namespace {

std::string
json(const std::string& text)
{
    std::string out = "\"";
    for (char c : text)
        out += c == '"' || c == '\\' ? std::string("\\") + c : std::string(1, c);
    return out + "\"";
}

// What a snapshot with change times holds for an entry of
// /var/db/timezone: its link target or file content, in JSON, or null.
std::string
at(const std::map<std::string, std::string>& tree, const std::string& name, const char* kind)
{
    auto entry = tree.find("/var/db/timezone/" + name);
    if (entry == tree.end() || entry->second.compare(0, strlen(kind), kind) != 0)
        return "null";
    size_t begin = strlen(kind);
    return json(entry->second.substr(begin, entry->second.rfind(" @") - begin));
}

// What tzlinks-status must have foretold of a run of tzlinks.
std::string
next_boot(const std::map<std::string, std::string>& before,
          const std::map<std::string, std::string>& after, const outcome& run_)
{
    bool written = at(after, "TZVersionDiffRecord", "") != at(before, "TZVersionDiffRecord", "");
    std::string messages;
    for (size_t at = 0, end; (end = run_.err.find('\n', at)) != std::string::npos; at = end + 1)
        messages += (messages.empty() ? "" : ",") + json(run_.err.substr(at, end - at));
    return ",\"zoneinfo\":" + at(after, "zoneinfo", "->") +
           ",\"icutz\":" + at(after, "icutz", "->") +
           ",\"localtime\":" + at(after, "localtime", "->") +
           ",\"record\":" + (written ? at(after, "TZVersionDiffRecord", "=") : "null") +
           ",\"exit_status\":" + std::to_string(run_.status) + ",\"messages\":[" + messages + "]}";
}

// The health and the ids of the findings in a JSON report.
std::string
health(const std::string& report)
{
    std::string found = report.substr(report.rfind(':') + 2);
    found.erase(found.find('"'));
    for (size_t at = 0; (at = report.find("{\"id\":\"", at)) != std::string::npos;) {
        at += 7;
        found += (found.find(':') == std::string::npos ? ":" : ",") +
                 report.substr(at, report.find('"', at) - at);
    }
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

    outcome report = run(program(TZLINKS_STATUS_BINARY, {"--json"}));
    EXPECT_EQ(snapshot(true), before) << "tzlinks-status changed the tree";
    EXPECT_EQ(health(report.out), r.health);
    EXPECT_EQ(report.status, r.health[0] == 'h' ? 0 : r.health[0] == 'd' ? 1 : 2);
    char copy[] = "/tmp/tzlinks-root.XXXXXX";
    ASSERT_TRUE(mkdtemp(copy) != nullptr);
    run({"sh", "-c", "mkdir $0/usr && cp -a /var $0 && cp -a /usr/share $0/usr", copy});
    EXPECT_EQ(run(program(TZLINKS_STATUS_BINARY, {"--json", "--root", copy})).out, report.out)
        << "the report differs through --root";

    outcome run_ = run(tzlinks(r.inject));
    EXPECT_EQ(run_.err, r.err);
    EXPECT_EQ(run_.status, r.exit);
    EXPECT_EQ(run_.out, "");
    EXPECT_EQ(changes(plain_before, snapshot()), r.changes);
    if (r.inject.empty()) { // what strace does, nothing can foresee
        std::string foretold = next_boot(before, snapshot(true), run_);
        EXPECT_NE(report.out.find(foretold, report.out.find("\"next_boot\"")), std::string::npos)
            << foretold;
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
        {{"--help"},
         0,
         usage + "Reports which time-zone data a device uses, what its next boot",
         ""},
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
        EXPECT_EQ(o.status, status);
        EXPECT_EQ(o.out.substr(0, out.size()), out);
        EXPECT_EQ(o.out.empty(), out.empty());
        EXPECT_EQ(o.err, err);
    }
    if (!sandbox_refused.empty())
        GTEST_SKIP() << "needs a private mount namespace: " << sandbox_refused;
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(build_tree("system_dataset 2023c 44l; live_system\n"
                           "relink tz_latest \"$(printf '/x\\303\\251\\377\\001')\""));
    std::string full;
    for (const std::string& word : program(TZLINKS_STATUS_BINARY, {}))
        full += word + " ";
    EXPECT_EQ(run({"sh", "-c", full + ">/dev/full"}).status, 74);
    EXPECT_NE(run(program(TZLINKS_STATUS_BINARY)).out.find("  tz_latest -> /xé\\xff\\x01\n"),
              std::string::npos);
    EXPECT_NE(run(program(TZLINKS_STATUS_BINARY, {"--json"}))
                  .out.find("\"tz_latest\":\"/xé\\udcff\\u0001\""),
              std::string::npos);
}

} // namespace
