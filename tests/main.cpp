#include "sandbox.h"

#include <gtest/gtest.h>

std::string sandbox_refused;

int
main(int argc, char** argv)
{
    // Before gtest or anything else can start a thread: a process with
    // more than one thread cannot enter a new user namespace.
    sandbox_refused = enter_sandbox();
    ::testing::InitGoogleTest(&argc, argv);
    return RUN_ALL_TESTS();
}
