#include "sandbox.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <fstream>
#include <ftw.h>
#include <iterator>
#include <sched.h>
#include <sstream>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

static bool
write_file(const char* path, const std::string& text)
{
    std::ofstream out(path);
    return static_cast<bool>(out << text << std::flush);
}

std::string
enter_sandbox()
{
    std::string uid = std::to_string(geteuid()), gid = std::to_string(getegid());
    if (unshare(CLONE_NEWUSER | CLONE_NEWNS) == 0) {
        write_file("/proc/self/setgroups", "deny");
        if (!write_file("/proc/self/uid_map", "0 " + uid + " 1\n") ||
            !write_file("/proc/self/gid_map", "0 " + gid + " 1\n"))
            return "cannot map ids in a new user namespace";
    } else {
        // Under an emulator, which runs threads, `unshare -Urm` makes the
        // namespaces before the tests start. Anywhere else (the initial
        // user namespace maps every id to itself) mounting would reach
        // the host.
        std::ifstream map("/proc/self/uid_map");
        std::string inside, outside, count;
        map >> inside >> outside >> count;
        if (inside == "0" && outside == "0" && count == "4294967295")
            return std::string("unshare: ") + strerror(errno);
    }
    if (mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0)
        return std::string("cannot make / private: ") + strerror(errno);
    return "";
}

bool
fresh_tree()
{
    static bool mounted = false;
    for (const char* dir : {"/var", "/usr/share"}) {
        if (mounted)
            umount2(dir, MNT_DETACH);
        if (mount("tzlinks-test", dir, "tmpfs", MS_NOSUID | MS_NODEV, "mode=0755") != 0)
            return false;
    }
    return mounted = true;
}

bool
build_tree(const std::string& commands)
{
    std::string script = ". " TZLINKS_SOURCE_DIR "/tools/sample-tree.sh\n" + commands;
    return run({"/bin/sh", "-euc", script}).status == 0;
}

static const char* runner = getenv("TZLINKS_RUNNER");

std::vector<std::string>
program(const std::string& path)
{
    std::istringstream words(runner ? runner : "");
    std::vector<std::string> argv{std::istream_iterator<std::string>(words), {}};
    argv.push_back(path);
    return argv;
}

static std::string
contents(int fd)
{
    std::string text;
    char buffer[65536];
    lseek(fd, 0, SEEK_SET);
    for (ssize_t n; (n = read(fd, buffer, sizeof buffer)) > 0;)
        text.append(buffer, static_cast<size_t>(n));
    close(fd);
    return text;
}

outcome
run(std::vector<std::string> words)
{
    std::vector<char*> args;
    for (std::string& word : words)
        args.push_back(word.data());
    args.push_back(nullptr);
    // Anonymous files rather than pipes: nothing to drain while waiting.
    int out = memfd_create("out", MFD_CLOEXEC), err = memfd_create("err", MFD_CLOEXEC);
    pid_t child = fork();
    if (child == 0) {
        dup2(out, 1);
        dup2(err, 2);
        close(0); // a program that waits for input fails rather than hangs
        alarm(runner ? 60 : 1);
        execvp(args[0], args.data());
        _exit(127);
    }
    int status = 0;
    waitpid(child, &status, 0);
    status = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    return {status, contents(out), contents(err)};
}

static std::map<std::string, std::string>* entries;
static bool times;

static int
describe(const char* path, const struct stat* st, int /*flag*/, struct FTW* /*ftw*/)
{
    std::string& what = (*entries)[path];
    if (S_ISLNK(st->st_mode)) {
        char target[8192];
        ssize_t n = readlink(path, target, sizeof target);
        what = "->" + std::string(target, n > 0 ? static_cast<size_t>(n) : 0);
    } else if (S_ISREG(st->st_mode)) {
        what = "=" + contents(open(path, O_RDONLY | O_CLOEXEC));
    } else {
        what = S_ISDIR(st->st_mode) ? "/" : "|";
    }
    if (times)
        what +=
            " @" + std::to_string(st->st_ctim.tv_sec) + "." + std::to_string(st->st_ctim.tv_nsec);
    return 0;
}

std::map<std::string, std::string>
snapshot(bool with_times)
{
    std::map<std::string, std::string> result;
    entries = &result;
    times = with_times;
    nftw("/var", describe, 16, FTW_PHYS);
    nftw("/usr/share", describe, 16, FTW_PHYS);
    return result;
}
