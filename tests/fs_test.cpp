// The four file-system primitives on real entries in a scratch directory.
// Paths are relative to it, and so are the paths in the expected warnings.
#include "outcome.h"
#include "sandbox.h"
#include "support/fs.h"

#include <cerrno>
#include <climits>
#include <cstdlib>
#include <functional>
#include <unistd.h>

namespace {

class fs_test : public ::testing::Test {
  protected:
    void SetUp() override
    {
        char pattern[] = "/tmp/tzlinks-fs-XXXXXX";
        ASSERT_NE(mkdtemp(pattern), nullptr);
        dir = pattern;
        ASSERT_EQ(chdir(dir.c_str()), 0);
        put_file("file", "x");
        put_dir("dir");
        put_link("gone", "dangling");
        put_link("file", "good");
    }
    void TearDown() override
    {
        ASSERT_EQ(chdir("/"), 0);
        ASSERT_EQ(system(("rm -rf " + dir).c_str()), 0);
    }
    std::string dir;
};

struct primitive_row {
    const char* name;
    std::function<std::string()> call; // returns what the primitive returned
    std::string result;
    std::string thrown;
    std::string message; // "" for silence
    int errnum;
    const char* path; // an entry to check afterwards
    std::string after;
};

std::string
removed(const char* path)
{
    velm_fs::remove(path);
    return "";
}

std::string
exists(const char* path)
{
    return velm_fs::path_exists(path) ? "true" : "false";
}

std::string
linked(const char* target, const char* path)
{
    velm_fs::create_symlink(target, path);
    return "";
}

const std::string long_target(1500, 'a');

const primitive_row primitive_rows[] = {
    {"remove_missing", [] { return removed("nothing"); }, "", "", "", 0, "nothing", "absent"},
    {"remove_dangling_link", [] { return removed("dangling"); }, "", "", "", 0, "dangling",
     "absent"},
    {"remove_link_keeps_target", [] { return removed("good"); }, "", "", "", 0, "file", "file:x"},
    {"remove_directory", [] { return removed("dir"); }, "", "int 21",
     "remove: could not remove dir", EISDIR, "dir", "dir"},
    {"remove_below_file", [] { return removed("file/x"); }, "", "int 20",
     "remove: could not remove file/x", ENOTDIR, "file", "file:x"},
    {"exists_file", [] { return exists("file"); }, "true", "", "", 0, "file", "file:x"},
    {"exists_link_to_file", [] { return exists("good"); }, "true", "", "", 0, "good", "-> file"},
    {"exists_dangling_link", [] { return exists("dangling"); }, "false", "", "", 0, "dangling",
     "-> gone"},
    {"exists_below_file", [] { return exists("file/x"); }, "false", "", "", 0, "file", "file:x"},
    {"read_missing", [] { return velm_fs::read_symlink("nothing"); }, "", "", "", 0, "nothing",
     "absent"},
    {"read_below_missing_dir", [] { return velm_fs::read_symlink("no/such"); }, "", "", "", 0, "no",
     "absent"},
    {"read_dangling_link", [] { return velm_fs::read_symlink("dangling"); }, "gone", "", "", 0,
     "dangling", "-> gone"},
    {"read_regular_file", [] { return velm_fs::read_symlink("file"); }, "", "int 22",
     "read_symlink: file", EINVAL, "file", "file:x"},
    {"read_below_file", [] { return velm_fs::read_symlink("file/x"); }, "", "int 20",
     "read_symlink: file/x", ENOTDIR, "file", "file:x"},
    {"read_long_target_is_cut",
     [] {
         put_link(long_target, "long");
         return velm_fs::read_symlink("long");
     },
     std::string(1024, 'a'), "", "", 0, "long", "-> " + long_target},
    {"create_dangling", [] { return linked("nowhere", "new"); }, "", "", "", 0, "new",
     "-> nowhere"},
    {"create_relative_unchanged", [] { return linked("../x//y/", "new"); }, "", "", "", 0, "new",
     "-> ../x//y/"},
    {"create_over_file", [] { return linked("target", "file"); }, "", "int 17",
     "create_symlink: from file to target", EEXIST, "file", "file:x"},
    {"create_over_dangling_link", [] { return linked("target", "dangling"); }, "", "int 17",
     "create_symlink: from dangling to target", EEXIST, "dangling", "-> gone"},
    {"create_in_missing_dir", [] { return linked("target", "no/link"); }, "", "int 2",
     "create_symlink: from no/link to target", ENOENT, "no", "absent"},
};

void
PrintTo(const primitive_row& row, std::ostream* os)
{
    *os << row.name;
}

class primitive : public fs_test, public ::testing::WithParamInterface<primitive_row> {};

TEST_P(primitive, warns_then_throws_errno)
{
    const primitive_row& row = GetParam();
    std::string result;
    outcome seen = observe([&] { result = row.call(); });
    EXPECT_EQ(result, row.result);
    EXPECT_EQ(seen.thrown, row.thrown);
    EXPECT_EQ(seen.err, row.message.empty() ? "" : warning(row.message, row.errnum));
    EXPECT_EQ(describe(row.path), row.after);
}

INSTANTIATE_TEST_SUITE_P(fs, primitive, ::testing::ValuesIn(primitive_rows),
                         [](const auto& row) { return std::string(row.param.name); });

} // namespace
