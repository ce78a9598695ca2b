// The sandbox itself: the fixed paths are writable inside it and the host
// never sees what is written there.
#include "sandbox.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

TEST_F(sandbox_test, writes_under_fixed_paths_stay_private)
{
    std::string name = "tzlinks-sandbox-probe-" + std::to_string(getpid());
    build_tree("put_file /var/db/timezone/" + name + " probe");
    EXPECT_EQ(describe("/var/db/timezone/" + name), "file:probe");

    struct stat host, sandbox;
    ASSERT_EQ(fstat(host_var_fd(), &host), 0);
    ASSERT_EQ(stat("/var", &sandbox), 0);
    EXPECT_NE(host.st_dev, sandbox.st_dev);
    EXPECT_NE(faccessat(host_var_fd(), ("db/timezone/" + name).c_str(), F_OK, 0), 0);
    EXPECT_EQ(errno, ENOENT);
}

TEST_F(sandbox_test, every_test_starts_from_an_empty_tree)
{
    EXPECT_EQ(describe("/var/db"), "absent");
    EXPECT_EQ(describe("/usr/share/zoneinfo.default"), "absent");
    EXPECT_EQ(describe("/usr/share/icu"), "absent");
}

} // namespace
