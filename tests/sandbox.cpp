#include "sandbox.h"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <fstream>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

static std::string refusal = "the sandbox was never entered";
static int var_fd = -1;

static bool
write_proc(const char* path, const std::string& text)
{
    int fd = open(path, O_WRONLY | O_CLOEXEC);
    if (fd < 0)
        return false;
    bool ok = write(fd, text.data(), text.size()) == static_cast<ssize_t>(text.size());
    close(fd);
    return ok;
}

// A wrapper such as `unshare -Urm` may have put us in a namespace already
// (needed where the process cannot unshare itself, e.g. under an emulator
// that runs threads). The initial namespace maps every id to itself.
static bool
in_child_user_namespace()
{
    std::ifstream map("/proc/self/uid_map");
    std::string inside, outside, count;
    map >> inside >> outside >> count;
    return !(inside == "0" && outside == "0" && count == "4294967295");
}

void
enter_sandbox()
{
    std::string uid = std::to_string(geteuid());
    std::string gid = std::to_string(getegid());
    if (unshare(CLONE_NEWUSER | CLONE_NEWNS) == 0) {
        write_proc("/proc/self/setgroups", "deny");
        if (!write_proc("/proc/self/uid_map", "0 " + uid + " 1\n") ||
            !write_proc("/proc/self/gid_map", "0 " + gid + " 1\n")) {
            refusal = std::string("cannot map ids in the new namespace: ") + strerror(errno);
            return;
        }
    } else if (!in_child_user_namespace()) {
        refusal = std::string("unshare(CLONE_NEWUSER|CLONE_NEWNS): ") + strerror(errno);
        return;
    }
    // Nothing mounted from here on may reach the host.
    if (mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) {
        refusal = std::string("cannot make / private: ") + strerror(errno);
        return;
    }
    var_fd = open("/var", O_PATH | O_DIRECTORY | O_CLOEXEC);
    refusal.clear();
}

const std::string&
sandbox_refusal()
{
    return refusal;
}

int
host_var_fd()
{
    return var_fd;
}

static bool
mount_empty(const char* path)
{
    return mount("tzlinks-test", path, "tmpfs", MS_NOSUID | MS_NODEV, "mode=0755") == 0;
}

void
sandbox_test::SetUp()
{
    if (!refusal.empty())
        GTEST_SKIP() << "needs a private mount namespace, refused here: " << refusal;
    if (!mount_empty("/var") || !mount_empty("/usr/share"))
        GTEST_SKIP() << "cannot mount over /var and /usr/share: " << strerror(errno);
    mounted = true;
}

void
sandbox_test::TearDown()
{
    if (!mounted)
        return;
    umount2("/usr/share", MNT_DETACH);
    umount2("/var", MNT_DETACH);
}

void
build_tree(const std::string& commands)
{
    if (commands.empty())
        return;
    std::string script =
        std::string(". '") + TZLINKS_SOURCE_DIR "/tools/sample-tree.sh'; " + commands;
    pid_t child = fork();
    if (child == 0) {
        execl("/bin/sh", "sh", "-euc", script.c_str(), static_cast<char*>(nullptr));
        _exit(127);
    }
    int status = -1;
    waitpid(child, &status, 0);
    ASSERT_EQ(status, 0) << "tree commands failed: " << commands;
}

std::string
describe(const std::string& path)
{
    struct stat st;
    if (lstat(path.c_str(), &st) != 0)
        return "absent";
    if (S_ISDIR(st.st_mode))
        return "dir";
    if (S_ISLNK(st.st_mode)) {
        char target[4096];
        ssize_t n = readlink(path.c_str(), target, sizeof target);
        return "-> " + std::string(target, n < 0 ? 0 : static_cast<size_t>(n));
    }
    std::ifstream in(path, std::ios::binary);
    return "file:" + std::string(std::istreambuf_iterator<char>(in), {});
}

std::string
warning(const std::string& message, int errnum, const std::string& prog)
{
    return (prog.empty() ? program_invocation_short_name : prog) + ": " + message + ": " +
           strerror(errnum) + "\n";
}
