// tzlinks-status beyond what every row of tests/tool.rows shows: its
// command line, and names that are not UTF-8.
#include "sandbox.h"

#include <gtest/gtest.h>

namespace {

const std::string usage = "usage: tzlinks-status [--json] [--root DIR]\n"
                          "       tzlinks-status --help | --version\n";

struct use {
    std::vector<std::string> args;
    int status;
    std::string out, err;
};

TEST(status, command_line)
{
    const use uses[] = {
        {{"--help"}, 0, usage, ""},
        {{"--version"}, 0, "tzlinks-status " TZLINKS_VERSION "\n", ""},
        {{"-x"}, 64, "", "tzlinks-status: unknown argument: -x\n" + usage},
        {{"--json", "--root"}, 64, "", "tzlinks-status: missing directory after: --root\n" + usage},
        {{"--root=/no/such"},
         66,
         "",
         "tzlinks-status: cannot read /no/such: No such file or directory\n"},
        {{"--root", "/dev/null"},
         66,
         "",
         "tzlinks-status: cannot read /dev/null: Not a directory\n"},
    };
    for (const use& u : uses) {
        std::vector<std::string> argv = program(TZLINKS_STATUS_BINARY);
        argv.insert(argv.end(), u.args.begin(), u.args.end());
        outcome o = run(argv);
        EXPECT_EQ(o.status, u.status) << u.args[0];
        EXPECT_EQ(o.out, u.out);
        EXPECT_EQ(o.err, u.err);
    }
}

// A byte that is not part of valid UTF-8 is written as \udcHH in JSON and
// as \xHH in text, and so is a control character (\u00HH in JSON).
TEST(status, bytes_that_are_not_utf8)
{
    if (!sandbox_refused.empty())
        GTEST_SKIP() << "needs a private mount namespace: " << sandbox_refused;
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(
        build_tree("system_dataset 2023c 44l; live_system\n"
                   "relink tz_latest \"$(printf '/var/db/timezone/tz/\\303\\251\\377\\001')\""));
    std::vector<std::string> argv = program(TZLINKS_STATUS_BINARY);
    EXPECT_NE(run(argv).out.find("tz_latest  -> /var/db/timezone/tz/é\\xff\\x01\n"),
              std::string::npos);
    argv.push_back("--json");
    EXPECT_NE(run(argv).out.find("\"tz_latest\":\"/var/db/timezone/tz/é\\udcff\\u0001\""),
              std::string::npos);
}

} // namespace
