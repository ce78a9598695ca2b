// SPDX-License-Identifier: Apache-2.0
#include "harness.h"

#include <algorithm>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

static const char* runner = getenv("TZLINKS_RUNNER");
static std::string without; // setpriv and its options, or nothing

void
drop_capabilities(const std::string& drop)
{
    without = drop.empty() ? "" : "setpriv --inh-caps=" + drop + " --bounding-set=" + drop + " ";
}
static const std::string live_dir = "/var/db/timezone/";

// A new file system goes over whatever an earlier test left there; but only
// in a user namespace of its own (CTest starts the tests under `unshare
// -Urm`): in the initial one, which maps every id, it would reach the host.
bool
fresh_tree()
{
    static bool etc = false; // once a process: the host's /etc with changes of its own
    std::string map;
    std::getline(std::ifstream("/proc/self/uid_map"), map);
    if (map.find("4294967295") != std::string::npos)
        return false;
    if (!etc &&
        (mount("tzlinks-test", "/dev/shm", "tmpfs", MS_NOSUID | MS_NODEV, "mode=1777") != 0 ||
         mkdir("/dev/shm/.etc", 0700) != 0 || mkdir("/dev/shm/.etc/upper", 0755) != 0 ||
         mkdir("/dev/shm/.etc/work", 0700) != 0 ||
         mount("tzlinks-test", "/etc", "overlay", MS_NOSUID | MS_NODEV,
               "lowerdir=/etc,upperdir=/dev/shm/.etc/upper,workdir=/dev/shm/.etc/work") != 0))
        return false;
    etc = true;
    return mount("tzlinks-test", "/var", "tmpfs", MS_NOSUID | MS_NODEV, "mode=0755") == 0 &&
           mount("tzlinks-test", "/usr/share", "tmpfs", MS_NOSUID | MS_NODEV, "mode=0755") == 0;
}

bool
build_tree(const std::string& commands)
{
    return run("set -eu; . " TZLINKS_SOURCE_DIR "/tools/sample-tree.sh\n" + commands).status == 0;
}

std::string
program(const std::string& path, const std::string& args)
{
    return "exec " + without + (runner ? runner : "") + " " + path + " " + args;
}

std::string
update_on_path()
{
    std::ofstream("/dev/shm/tzlinks-update") << "#!/bin/sh\n"
                                             << program(TZLINKS_UPDATE_BINARY, "\"$@\"") << "\n";
    chmod("/dev/shm/tzlinks-update", 0755);
    return "PATH=/dev/shm:$PATH ";
}

std::string
tzlinks(const std::string& inject, const std::string& trace)
{
    std::string strace = "strace -f -qq -o " + (trace.empty() ? "/dev/null" : trace) +
                         " -E ASAN_OPTIONS=detect_leaks=0 " +
                         (inject.empty() ? "" : "-e inject=" + inject) + " ";
    bool traced = !inject.empty() || !trace.empty();
    return "exec " + without + (traced ? strace : "") + (runner ? runner : "") + " " TZLINKS_BINARY;
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
run(const std::string& command)
{
    // Anonymous files rather than pipes: nothing to drain while waiting.
    int out = memfd_create("out", MFD_CLOEXEC), err = memfd_create("err", MFD_CLOEXEC);
    pid_t child = fork();
    if (child == 0) {
        dup2(out, 1), dup2(err, 2), close(0); // waiting for input fails, not hangs
        alarm(runner ? 60 : 10);
        execl("/bin/sh", "sh", "-c", command.c_str(), nullptr);
        _exit(127);
    }
    int status = 0;
    struct rusage usage = {};
    timespec start = {}, end = {};
    clock_gettime(CLOCK_MONOTONIC, &start);
    wait4(child, &status, 0, &usage);
    clock_gettime(CLOCK_MONOTONIC, &end);
    status = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    return {status, contents(out), contents(err), usage.ru_maxrss,
            static_cast<double>(end.tv_sec - start.tv_sec) +
                static_cast<double>(end.tv_nsec - start.tv_nsec) / 1e9};
}

std::string
schema_breaks(const std::vector<std::string>& reports)
{
    if (runner != nullptr || TZLINKS_SANITIZED)
        return "";
    std::string files;
    for (size_t i = 0; i < reports.size(); ++i) {
        std::string name = "/dev/shm/report." + std::to_string(i) + ".json";
        std::ofstream(name) << reports[i];
        files += " " + name;
    }
    return run("exec /usr/bin/python3 " TZLINKS_SOURCE_DIR "/tools/test-schema " TZLINKS_SOURCE_DIR
               "/docs/status.schema.json" +
               files)
        .out;
}

std::vector<std::string>
ids(const nlohmann::json& report, const char* list)
{
    std::vector<std::string> found;
    for (const nlohmann::json& finding : report[list])
        found.push_back(finding["id"]);
    return found;
}

std::string
joined(const nlohmann::json& texts, const std::string& between)
{
    std::string out;
    for (const nlohmann::json& text : texts)
        out += (out.empty() ? "" : between) + text.get<std::string>();
    return out;
}

std::map<std::string, std::string>
snapshot(bool with_times)
{
    std::map<std::string, std::string> entries;
    for (const char* top : {"/var", "/usr/share"}) {
        for (const auto& entry : std::filesystem::recursive_directory_iterator(top)) {
            const std::string& path = entry.path();
            struct stat st = {};
            lstat(path.c_str(), &st);
            std::string& what = entries[path] =
                S_ISLNK(st.st_mode)   ? "->" + std::filesystem::read_symlink(path).string()
                : S_ISREG(st.st_mode) ? "=" + contents(open(path.c_str(), O_RDONLY | O_CLOEXEC))
                : S_ISDIR(st.st_mode) ? "/"
                                      : "|";
            if (with_times)
                what += " @" + std::to_string(st.st_ctim.tv_sec) + "." +
                        std::to_string(st.st_ctim.tv_nsec);
        }
    }
    return entries;
}

// \s a space, \*N:c the character c N times.
static std::string
unescape(std::string text)
{
    for (size_t at; (at = text.find("\\s")) != std::string::npos;)
        text.replace(at, 2, " ");
    for (size_t at, colon; (at = text.find("\\*")) != std::string::npos;) {
        colon = text.find(':', at);
        text.replace(at, colon + 2 - at, std::stoul(text.substr(at + 2)), text.at(colon + 1));
    }
    return text;
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
parse(const std::string& line, bool tzlinks)
{
    std::vector<std::string> fields;
    std::istringstream split(line);
    for (std::string field; std::getline(split, field, '|');)
        fields.push_back(field.substr(std::min(field.find_first_not_of(' '), field.size())));
    row r;
    std::istringstream head(fields.at(0)), words(fields.at(2));
    head >> r.name;
    if (!tzlinks) // tests/update.rows: arguments, then what comes of them
        r.args = fields.at(2),
        r.expect = fields.at(3).substr(0, fields[3].find_last_not_of(' ') + 1);
    for (std::string option; head >> option;) {
        if (option.compare(0, 7, "inject=") == 0)
            r.inject = option.substr(7);
        else if (option.compare(0, 5, "caps=") == 0)
            r.caps = option.substr(5);
        else
            (option == "local" ? r.local : r.faults) = true;
    }
    r.tree = fields.at(1);
    for (std::string word; tzlinks && words >> word;) {
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

bool
set_up(const row& r)
{
    drop_capabilities(r.caps);
    return fresh_tree() && build_tree("system_dataset 2023c 44l; etc_localtime\n" + r.tree);
}

std::vector<row>
load_rows(const std::string& table)
{
    std::ifstream in(TZLINKS_SOURCE_DIR "/tests/" + table);
    std::map<std::string, std::string> named = {{"@", live_dir + "tz/"}};
    std::vector<std::string> lines;
    for (std::string line; std::getline(in, line);) {
        for (const auto& [name, text] : named) { // defined before any row uses them
            for (size_t at; (at = line.find(name)) != std::string::npos;)
                line.replace(at, name.size(), text);
        }
        if (line[0] == '$')
            named[line.substr(0, line.find(' '))] = line.substr(line.find(" = ") + 3);
        else if (line[0] == ' ')
            lines.back() += line;
        else if (!line.empty() && line[0] != '#')
            lines.push_back(line);
    }
    std::vector<row> rows;
    for (const std::string& line : lines)
        rows.push_back(parse(line, table == "tool.rows"));
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
