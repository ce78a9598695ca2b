// Runs the rows of tests/tool.rows: the real tzlinks binary on a sample
// device tree in the sandbox, with its exact standard error, exit status
// and every entry it changes.
#include "rows.h"
#include "sandbox.h"

#include <gtest/gtest.h>

void
PrintTo(const row& r, std::ostream* os)
{
    *os << r.name;
}

namespace {

class tool : public ::testing::TestWithParam<row> {};

TEST_P(tool, row)
{
    const row& r = GetParam();
    if (!sandbox_refused.empty())
        GTEST_SKIP() << "needs a private mount namespace: " << sandbox_refused;
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(build_tree("system_dataset 2023c 44l\n" + r.tree)) << r.tree;
    auto before = snapshot();

    std::vector<std::string> argv, tzlinks = program(TZLINKS_BINARY);
    if (!r.inject.empty())
        argv = {"strace", "-f", "-qq", "-o", "/dev/null", "-e", "inject=" + r.inject};
    argv.insert(argv.end(), tzlinks.begin(), tzlinks.end());
    outcome run_ = run(argv);
    EXPECT_EQ(run_.err, r.err);
    EXPECT_EQ(run_.status, r.exit);
    EXPECT_EQ(run_.out, "");
    EXPECT_EQ(changes(before, snapshot()), r.changes);
}

std::string
row_name(const ::testing::TestParamInfo<row>& info)
{
    return info.param.name;
}

INSTANTIATE_TEST_SUITE_P(tzlinks, tool, ::testing::ValuesIn(load_rows()), row_name);

} // namespace
