// The fault and power-cut mode (tzlinks_tests --faults): every end-to-end
// row again, with strace failing each call tzlinks makes on the file
// system in turn (once; a change of the tree also from then on, as on a
// file system turning read-only), and killing it on entry to each call
// that changes the tree. Each run must end with status 0, or with errno
// after the last resort's message, and write only the tool's own messages;
// settled by clean runs, the device must then be no worse than after an
// uninterrupted run, as tzlinks-status judges, but for the lasting states
// that the README documents. A cut ends the same as an uninterrupted run,
// working but different, or broken.
#include "harness.h"

#include <cstring>
#include <fstream>
#include <iostream>
#include <regex>
#include <sched.h>
#include <set>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

// The failures each call meets on a device; ENOENT where it means
// something of its own to the tool.
const std::string failures = " openat:EACCES openat:ENOENT read:EIO write:ENOSPC close:EIO "
                             "fstat:EIO newfstatat:EIO getdents64:EIO access:EACCES readlink:EIO "
                             "readlink:ENOENT unlink:EROFS unlink:ENOENT symlink:EROFS rmdir:EROFS";
const std::set<std::string> lasting = {"icutz-stale", "icutz-missing", "icutz-with-system"};

// Counts of both workers, in memory they share.
struct tally {
    int injected, lasting, cuts, same, different, broken, violations, statuses[256];
} * t;
std::string row_name;
std::regex own; // every message the tool's sources hand to warn(3)

void
violation(const std::string& how, const std::string& what)
{
    std::cout << "VIOLATION " + row_name + ": " + how + ": " + what + "\n" << std::flush;
    ++t->violations;
}

outcome
tzlinks(const std::string& inject = "")
{
    if (inject.empty())
        return run({TZLINKS_BINARY});
    return run(
        {"strace", "-f", "-qq", "-o", "/dev/null", "-e", "inject=" + inject, TZLINKS_BINARY});
}

// Two clean runs settle the tree (after an update older than the system
// data was adopted, the next run still resets to the system data); then
// what tzlinks-status finds wrong, notes aside, beyond what is expected:
// 0 nothing, 1 only lasting states, 2 more.
int
settle(const std::set<std::string>& expected, std::set<std::string>* found = nullptr)
{
    tzlinks(), tzlinks();
    std::string report = run({TZLINKS_STATUS_BINARY, "--json"}).out;
    std::regex finding("\\{\"id\":\"([^\"]*)\",\"severity\":\"(error|warning)\"");
    int worse = 0;
    for (std::sregex_iterator m(report.begin(), report.end(), finding), end; m != end; ++m) {
        if (expected.count((*m)[1]) == 0)
            worse = std::max(worse, lasting.count((*m)[1]) != 0 ? 1 : 2);
        if (found != nullptr)
            found->insert((*m)[1]);
    }
    return worse;
}

void
inject(const std::string& how, const std::set<std::string>& expected)
{
    outcome o = tzlinks(how);
    std::string line, last, resort = "tzlinks: Last resort force_system_dataset() failed: ";
    for (std::istringstream lines(o.err); std::getline(lines, line); last = line) {
        if (!std::regex_match(line, own))
            violation(how, "not its own message: " + line);
    }
    if (o.status != 0 && (last.compare(0, resort.size(), resort) != 0 ||
                          (o.status != 255 && last != resort + strerror(o.status))))
        violation(how, "exit status " + std::to_string(o.status));
    int worse = settle(expected);
    if (worse == 2)
        violation(how, "the device is worse than without the failure");
    ++t->injected, ++t->statuses[o.status & 255], t->lasting += worse == 1;
}

void
cut(const std::string& how, const std::set<std::string>& expected,
    const std::map<std::string, std::string>& reference)
{
    if (tzlinks(how).status != 128 + 9)
        violation(how, "not killed");
    bool broken = settle(expected) == 2;
    auto settled = snapshot();
    if (tzlinks(), snapshot() != settled)
        violation(how, "a later run changed the tree again");
    if (broken)
        violation(how, "broken");
    ++t->cuts, t->broken += broken, t->same += !broken && settled == reference;
    t->different += !broken && settled != reference;
}

void
try_row(const row& r)
{
    const std::string saved = "/tmp/tzlinks-faults." + std::to_string(getpid());
    const std::vector<std::string> restore = {"sh", "-c", "rm -rf /var/* && cp -a $0/. /var",
                                              saved};
    row_name = r.name;
    fresh_tree();
    build_tree("system_dataset 2023c 44l\n" + r.tree);
    run({"sh", "-c", "rm -rf $0 && cp -a /var $0", saved});
    run({"strace", "-f", "-qq", "-o", saved + ".trace", TZLINKS_BINARY});
    std::set<std::string> expected;
    settle({}, &expected);
    auto reference = snapshot();
    std::ifstream trace(saved + ".trace");
    std::map<std::string, int> seen;
    bool started = false;
    std::smatch call;
    for (std::string text; std::getline(trace, text);) {
        if (!std::regex_search(text, call, std::regex("^[0-9]+ +([a-z0-9_]+)\\((.*)\\) += ")))
            continue;
        std::string name = call[1], when = std::to_string(++seen[name]), args = call[2];
        started = started || args.find("/var/db/timezone") != std::string::npos;
        if (!started || (name == "write" && args.compare(0, 2, "2,") == 0))
            continue; // the loader's calls, and the warnings' own writes
        bool changes = name == "unlink" || name == "symlink" || name == "rmdir" ||
                       name == "write" || args.find("O_CREAT") != std::string::npos;
        for (size_t at = 0; (at = failures.find(" " + name + ":", at)) != std::string::npos;) {
            at += name.size() + 2;
            std::string error = failures.substr(at, failures.find(' ', at) - at);
            run(restore), inject(name + ":error=" + error + ":when=" + when, expected);
        }
        if (changes && name != "write")
            run(restore), inject(name + ":error=EROFS:when=" + when + "+", expected);
        if (changes)
            run(restore), cut(name + ":signal=KILL:when=" + when, expected, reference);
    }
    run({"rm", "-rf", saved, saved + ".trace"});
}

// The messages of the tool's sources as one alternation: each format with
// its %s and %d as patterns, the rest as it stands.
std::string
own_messages()
{
    std::string all, source;
    const std::regex call("warn\\(\"([^\"]*)\""), special("[.^$|()\\[\\]{}*+?\\\\]");
    for (const char* file : {"dataset/dataset.cpp", "dataset/icu.cpp", "dataset/zoneinfo.cpp",
                             "driver/icu_migration.cpp", "driver/localtime.cpp",
                             "driver/startup.cpp", "support/fs.cpp", "support/version.cpp"}) {
        std::ifstream in(TZLINKS_SOURCE_DIR "/" + std::string(file));
        source.assign(std::istreambuf_iterator<char>(in), {});
        for (std::sregex_iterator m(source.begin(), source.end(), call), end; m != end; ++m)
            all += (all.empty() ? "" : "|") + std::regex_replace((*m)[1].str(), special, "\\$&");
    }
    all = std::regex_replace(all, std::regex("%s"), ".*");
    return std::regex_replace(all, std::regex("%d"), "-?[0-9]+");
}

} // namespace

// Two workers, each in a mount namespace of its own, take every other row.
int
run_faults()
{
    t = static_cast<tally*>(mmap(nullptr, 2 * sizeof(tally), PROT_READ | PROT_WRITE,
                                 MAP_SHARED | MAP_ANONYMOUS, -1, 0));
    own = std::regex("tzlinks: (" + own_messages() + "): .*");
    std::vector<row> rows = load_rows();
    for (size_t w = 0; w < 2; ++w) {
        if (fork() != 0)
            continue;
        t += w;
        unshare(CLONE_NEWNS);
        mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr);
        for (size_t i = w; i < rows.size(); i += 2) {
            if (rows[i].inject.empty())
                try_row(rows[i]);
        }
        _exit(0);
    }
    while (wait(nullptr) > 0) {
    }
    tally& a = t[0];
    a.injected += t[1].injected, a.lasting += t[1].lasting, a.cuts += t[1].cuts;
    a.same += t[1].same, a.different += t[1].different, a.broken += t[1].broken;
    std::cout << "injected failures: " << a.injected << ", " << a.lasting
              << " of them leaving a documented lasting state\n  exit statuses:";
    for (int status = 0; status < 256; ++status) {
        if (a.statuses[status] + t[1].statuses[status] != 0)
            std::cout << " " << status << " x" << a.statuses[status] + t[1].statuses[status];
    }
    std::cout << "\npower cuts: " << a.cuts << ": " << a.same << " same, " << a.different
              << " working but different, " << a.broken
              << " broken\nfaults: " << a.violations + t[1].violations << " violations\n";
    return a.violations + t[1].violations == 0 ? 0 : 1;
}
