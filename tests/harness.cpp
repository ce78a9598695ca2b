#include "harness.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <fstream>
#include <ftw.h>
#include <gtest/gtest.h>
#include <iterator>
#include <sched.h>
#include <sstream>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/wait.h>
#include <unistd.h>

std::string sandbox_refused;
static const char* runner = getenv("TZLINKS_RUNNER");
static const std::string live_dir = "/var/db/timezone/";

// Under an emulator, which runs threads of its own, `unshare -Urm` has
// made the namespaces already; anywhere else, the initial user namespace
// maps every id to itself and mounting would reach the host.
static std::string
enter_sandbox()
{
    std::string ids[2] = {std::to_string(geteuid()), std::to_string(getegid())}, map;
    if (unshare(CLONE_NEWUSER | CLONE_NEWNS) == 0) {
        std::ofstream("/proc/self/setgroups") << "deny";
        std::ofstream("/proc/self/uid_map") << "0 " + ids[0] + " 1";
        std::ofstream("/proc/self/gid_map") << "0 " + ids[1] + " 1";
    } else if (std::getline(std::ifstream("/proc/self/uid_map"), map),
               map.find("4294967295") != std::string::npos) {
        return std::string("unshare: ") + strerror(errno);
    }
    if (mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0)
        return std::string("cannot make / private: ") + strerror(errno);
    return "";
}

// A new file system goes over whatever an earlier test left there.
bool
fresh_tree()
{
    return mount("tzlinks-test", "/var", "tmpfs", MS_NOSUID | MS_NODEV, "mode=0755") == 0 &&
           mount("tzlinks-test", "/usr/share", "tmpfs", MS_NOSUID | MS_NODEV, "mode=0755") == 0;
}

bool
build_tree(const std::string& commands)
{
    return run({"/bin/sh", "-euc", ". " TZLINKS_SOURCE_DIR "/tools/sample-tree.sh\n" + commands})
               .status == 0;
}

static std::vector<std::string>
words(const std::string& text)
{
    std::istringstream split(text);
    return {std::istream_iterator<std::string>(split), {}};
}

std::vector<std::string>
program(const std::string& path, std::vector<std::string> args)
{
    std::vector<std::string> argv = words(runner ? runner : "");
    argv.push_back(path);
    argv.insert(argv.end(), args.begin(), args.end());
    return argv;
}

std::vector<std::string>
tzlinks(const std::string& inject)
{
    std::string strace = "strace -f -qq -o /dev/null -E ASAN_OPTIONS=detect_leaks=0 -e inject=";
    return words((inject.empty() ? "" : strace + inject + " ") + (runner ? runner : "") +
                 " " TZLINKS_BINARY);
}

static std::string
contents(int fd)
{
    std::string text(static_cast<size_t>(std::max(lseek(fd, 0, SEEK_END), off_t(0))), '\0');
    text.resize(static_cast<size_t>(std::max(pread(fd, text.data(), text.size(), 0), ssize_t(0))));
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
        dup2(out, 1), dup2(err, 2), close(0); // waiting for input fails, not hangs
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
describe(const char* path, const struct stat* st, int, struct FTW*)
{
    char target[8192];
    ssize_t n = S_ISLNK(st->st_mode) ? readlink(path, target, sizeof target) : 0;
    std::string& what = (*entries)[path] =
        S_ISLNK(st->st_mode)
            ? "->" + std::string(target, static_cast<size_t>(std::max(n, ssize_t(0))))
        : S_ISREG(st->st_mode) ? "=" + contents(open(path, O_RDONLY | O_CLOEXEC))
        : S_ISDIR(st->st_mode) ? "/"
                               : "|";
    if (times)
        what +=
            " @" + std::to_string(st->st_ctim.tv_sec) + "." + std::to_string(st->st_ctim.tv_nsec);
    return 0;
}

std::map<std::string, std::string>
snapshot(bool with_times)
{
    std::map<std::string, std::string> result;
    entries = &result, times = with_times;
    nftw("/var", describe, 16, FTW_PHYS), nftw("/usr/share", describe, 16, FTW_PHYS);
    return result;
}

std::string
unescape(const std::string& text)
{
    std::string plain;
    for (size_t i = 0; i < text.size(); ++i) {
        if (text[i] != '\\' || i + 1 == text.size()) {
            plain += text[i];
        } else if (text[++i] == '*') {
            size_t colon = text.find(':', i);
            plain.append(std::stoul(text.substr(i + 1, colon - i - 1)), text.at(colon + 1));
            i = colon + 1;
        } else {
            plain += text[i] == 's' ? ' ' : text[i] == 'n' ? '\n' : text[i];
        }
    }
    return plain;
}

// ERRNO TEXT as warn(3) writes it; ERRNO is a name, 0, or a number that is
// no errno (strace can inject those).
static std::string
message(const std::string& field)
{
    std::string errno_name = field.substr(0, field.find(' ')),
                text = field.substr(field.find(' ') + 1);
    int e = 4095;
    while (e > 0 && errno_name != std::to_string(e) &&
           (strerrorname_np(e) == nullptr || errno_name != strerrorname_np(e)))
        --e;
    return "tzlinks: " + unescape(text.substr(0, text.find_last_not_of(' ') + 1)) + ": " +
           strerror(e) + "\n";
}

static row
parse(const std::string& line)
{
    std::vector<std::string> fields;
    std::istringstream split(line);
    for (std::string field; std::getline(split, field, '|');)
        fields.push_back(field.substr(std::min(field.find_first_not_of(' '), field.size())));
    row r;
    std::istringstream head(fields.at(0)), words(fields.at(2));
    head >> r.name >> r.inject;
    r.inject = r.inject.substr(r.inject.find('=') + 1), r.tree = fields.at(1);
    for (std::string word; words >> word;) {
        if (word.compare(0, 5, "exit=") == 0)
            r.exit = std::stoi(word.substr(5));
        else if (word.find_first_of("=>/") == std::string::npos && word[0] != '-')
            r.health = word;
        else
            r.changes.push_back(unescape(word));
    }
    std::sort(r.changes.begin(), r.changes.end());
    for (size_t i = 3; i < fields.size(); ++i)
        r.err += message(fields[i]);
    return r;
}

std::vector<row>
load_rows()
{
    std::ifstream in(TZLINKS_SOURCE_DIR "/tests/tool.rows");
    std::map<std::string, std::string> named = {{"@", live_dir + "tz/"}};
    std::vector<std::string> lines;
    for (std::string line; std::getline(in, line);) {
        if (line[0] == '$')
            named[line.substr(0, line.find(' '))] = line.substr(line.find(" = ") + 3);
        else if (line[0] == ' ')
            lines.back() += line;
        else if (!line.empty() && line[0] != '#')
            lines.push_back(line);
    }
    std::vector<row> rows;
    for (std::string& line : lines) {
        for (const auto& [name, text] : named) {
            for (size_t at; (at = line.find(name)) != std::string::npos;)
                line.replace(at, name.size(), text);
        }
        rows.push_back(parse(line));
    }
    return rows;
}

std::vector<std::string>
changes(std::map<std::string, std::string> before, const std::map<std::string, std::string>& after)
{
    std::vector<std::string> changed;
    auto name = [](const std::string& path) {
        return path == live_dir + "TZVersionDiffRecord"          ? "record"
               : path.compare(0, live_dir.size(), live_dir) == 0 ? path.substr(live_dir.size())
                                                                 : path;
    };
    for (const auto& [path, what] : after) {
        if (before.count(path) == 0 || before[path] != what)
            changed.push_back(name(path) + what);
        before.erase(path);
    }
    for (const auto& [path, what] : before)
        changed.push_back("-" + name(path));
    std::sort(changed.begin(), changed.end());
    return changed;
}

int
main(int argc, char** argv)
{
    // Before gtest or anything else can start a thread: a process with
    // more than one thread cannot enter a new user namespace.
    sandbox_refused = enter_sandbox();
    ::testing::InitGoogleTest(&argc, argv);
    return RUN_ALL_TESTS();
}
