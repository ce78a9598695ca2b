// Runs the rows of tests/tool.rows: the real tzlinks binary on a sample
// device tree in the sandbox, with its exact standard error, exit status
// and every entry it changes. Before it, tzlinks-status reads the same
// tree, from inside and through --root on a copy: both reports must be the
// same, change nothing, and foretell exactly what tzlinks then does.
#include "rows.h"
#include "sandbox.h"

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

// What a snapshot with change times says of an entry: its link target or
// file content (in JSON), or null.
std::string
at(const std::map<std::string, std::string>& tree, const std::string& name, const char* kind)
{
    auto entry = tree.find("/var/db/timezone/" + name);
    if (entry == tree.end() || entry->second.compare(0, strlen(kind), kind) != 0)
        return "null";
    size_t begin = strlen(kind);
    return json(entry->second.substr(begin, entry->second.rfind(" @") - begin));
}

// What tzlinks-status must have said of the run that went from before to
// after (both with change times) with this outcome.
std::string
next_boot(const std::map<std::string, std::string>& before,
          const std::map<std::string, std::string>& after, const outcome& run_)
{
    const std::string record = "/var/db/timezone/TZVersionDiffRecord";
    auto was = before.find(record), is = after.find(record);
    bool rewritten = is != after.end() && (was == before.end() || was->second != is->second);
    std::string written = rewritten ? at(after, "TZVersionDiffRecord", "=") : "null", messages;
    for (size_t at = 0, end; (end = run_.err.find('\n', at)) != std::string::npos; at = end + 1)
        messages += (messages.empty() ? "" : ",") + json(run_.err.substr(at, end - at));
    return "\"next_boot\":{\"zoneinfo\":" + at(after, "zoneinfo", "->") +
           ",\"icutz\":" + at(after, "icutz", "->") +
           ",\"localtime\":" + at(after, "localtime", "->") + ",\"record\":" + written +
           ",\"exit_status\":" + std::to_string(run_.status) + ",\"messages\":[" + messages + "]}";
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

    std::vector<std::string> status = program(TZLINKS_STATUS_BINARY);
    status.push_back("--json");
    outcome report = run(status);
    EXPECT_EQ(snapshot(true), before) << "tzlinks-status changed the tree";
    char copy[] = "/tmp/tzlinks-root.XXXXXX";
    ASSERT_TRUE(mkdtemp(copy) != nullptr);
    run({"sh", "-c", "mkdir -p $0/usr && cp -a /var $0 && cp -a /usr/share $0/usr", copy});
    status.insert(status.end(), {"--root", copy});
    EXPECT_EQ(run(status).out, report.out) << "the report differs through --root";
    std::string found = report.out.substr(report.out.rfind(':') + 2); // the health
    found.erase(found.find('"'));
    EXPECT_EQ(report.status, found == "healthy" ? 0 : found == "degraded" ? 1 : 2);
    for (size_t at = 0; (at = report.out.find("{\"id\":\"", at)) != std::string::npos;) {
        at += 7;
        found += (found.find(':') == std::string::npos ? ":" : ",") +
                 report.out.substr(at, report.out.find('"', at) - at);
    }
    EXPECT_EQ(found, r.report);
    run({"rm", "-rf", copy});

    std::vector<std::string> argv, tzlinks = program(TZLINKS_BINARY);
    if (!r.inject.empty())
        argv = {"strace", "-f", "-qq", "-o", "/dev/null", "-e", "inject=" + r.inject};
    argv.insert(argv.end(), tzlinks.begin(), tzlinks.end());
    outcome run_ = run(argv);
    EXPECT_EQ(run_.err, r.err);
    EXPECT_EQ(run_.status, r.exit);
    EXPECT_EQ(run_.out, "");
    auto after = snapshot(true);
    EXPECT_EQ(changes(plain_before, snapshot()), r.changes);
    if (r.inject.empty()) { // what strace does, nothing can foresee
        EXPECT_NE(report.out.find(next_boot(before, after, run_)), std::string::npos)
            << report.out << "\nwants " << next_boot(before, after, run_);
    }
}

std::string
row_name(const ::testing::TestParamInfo<row>& info)
{
    return info.param.name;
}

INSTANTIATE_TEST_SUITE_P(tzlinks, tool, ::testing::ValuesIn(load_rows()), row_name);

} // namespace
