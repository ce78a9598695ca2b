// A private user and mount namespace in which fresh, empty directories hide
// the host's /var and /usr/share, so that the tool's fixed paths can be
// exercised without touching the machine the tests run on.
#ifndef TZLINKS_TESTS_SANDBOX_H
#define TZLINKS_TESTS_SANDBOX_H

#include <gtest/gtest.h>

#include <string>
#include <sys/types.h>

// Called once from main, before anything could start a thread.
void enter_sandbox();
// Why the sandbox could not be entered; empty when it was.
const std::string& sandbox_refusal();
// A descriptor of the host's /var as it was before the sandbox hid it.
int host_var_fd();

// Every test of this fixture starts from an empty /var and /usr/share, or
// is skipped with the reason when namespaces are refused.
class sandbox_test : public ::testing::Test {
  protected:
    void SetUp() override;
    void TearDown() override;

  private:
    bool mounted = false;
};

// Runs sample-tree commands (tools/sample-tree.sh) against the fixed paths.
void build_tree(const std::string& commands);

// What stands at path, in one comparable word: "-> target" for a link,
// "file:content" for a file, "dir" or "absent".
std::string describe(const std::string& path);

// What the tool's warn(3) writes for message with errno errnum, for a
// program called prog (the running test binary by default).
std::string warning(const std::string& message, int errnum, const std::string& prog = "");

#endif
