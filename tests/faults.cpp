// The fault and power-cut mode: with TZLINKS_FAULTS set, every end-to-end
// row also runs tzlinks again and again from its tree, with strace failing
// each call it makes on the file system in turn (once; a change of the
// tree also from then on, as on a file system turning read-only), and
// killing it on entry to each call that changes the tree. Each run must
// end with status 0, or with errno after the last resort's message, and
// write only the tool's own messages; settled by clean runs, the device
// must then be no worse than after an uninterrupted run, as tzlinks-status
// judges, but for the lasting states that the README documents. A cut ends
// the same as an uninterrupted run, working but different, or broken. Each
// row prints its counts on a line of its own, which tools/test adds up.
#include "harness.h"

#include <cstring>
#include <fstream>
#include <gtest/gtest.h>
#include <iostream>
#include <regex>
#include <set>

namespace {

// The failures each call meets on a device; ENOENT where it means
// something of its own to the tool.
const std::string failures =
    " openat:EACCES openat:ENOENT read:EIO write:ENOSPC close:EIO "
    "fstat:EIO newfstatat:EIO getdents64:EIO access:EACCES readlink:EIO "
    "readlink:ENOENT unlink:EROFS unlink:ENOENT symlink:EROFS rmdir:EROFS ftruncate:EIO";
const std::set<std::string> lasting = {"icutz-stale", "icutz-missing", "icutz-with-system"};

// Every message the tool's sources hand to warn(3), each format's %s and
// %d as patterns, the rest as it stands.
std::regex
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
    all = std::regex_replace(std::regex_replace(all, std::regex("%s"), ".*"), std::regex("%d"),
                             "-?[0-9]+");
    return std::regex("tzlinks: (" + all + "): .*");
}

// Two clean runs settle the tree (after an update older than the system
// data was adopted, the next run still resets to the system data); then
// what tzlinks-status finds wrong, notes aside, beyond what is expected:
// 0 nothing, 1 only lasting states, 2 more.
int
settle(const std::set<std::string>& expected, std::set<std::string>* found = nullptr)
{
    run(tzlinks()), run(tzlinks());
    std::string report = run({TZLINKS_STATUS_BINARY, "--json"}).out;
    static const std::regex finding("\\{\"id\":\"([^\"]*)\",\"severity\":\"(error|warning)\"");
    int worse = 0;
    for (std::sregex_iterator m(report.begin(), report.end(), finding), end; m != end; ++m) {
        if (expected.count((*m)[1]) == 0)
            worse = std::max(worse, lasting.count((*m)[1]) != 0 ? 1 : 2);
        if (found != nullptr)
            found->insert((*m)[1]);
    }
    return worse;
}

struct counts {
    int injected = 0, lasting = 0, cuts = 0, same = 0, different = 0, broken = 0;
    std::map<int, int> statuses;
};

void
inject(const std::string& how, const std::set<std::string>& expected, counts& c)
{
    static const std::regex own = own_messages();
    outcome o = run(tzlinks(how));
    std::string line, last, resort = "tzlinks: Last resort force_system_dataset() failed: ";
    for (std::istringstream lines(o.err); std::getline(lines, line); last = line)
        EXPECT_TRUE(std::regex_match(line, own)) << how << ": not its own message: " << line;
    EXPECT_TRUE(o.status == 0 || last == resort + strerror(o.status) ||
                (o.status == 255 && last.compare(0, resort.size(), resort) == 0))
        << how << ": exit status " << o.status;
    int worse = settle(expected);
    EXPECT_NE(worse, 2) << how << ": the device is worse than without the failure";
    ++c.injected, ++c.statuses[o.status], c.lasting += worse == 1;
}

void
cut(const std::string& how, const std::set<std::string>& expected,
    const std::map<std::string, std::string>& reference, counts& c)
{
    EXPECT_EQ(run(tzlinks(how)).status, 128 + 9) << how << ": not killed";
    bool broken = settle(expected) == 2;
    EXPECT_FALSE(broken) << how << ": broken";
    auto settled = snapshot();
    run(tzlinks());
    EXPECT_EQ(snapshot(), settled) << how << ": a later run changed the tree again";
    ++c.cuts, c.broken += broken, c.same += !broken && settled == reference;
    c.different += !broken && settled != reference;
}

} // namespace

void
try_faults(const std::string& pristine)
{
    const std::vector<std::string> restore = {"sh", "-c", "rm -rf /var/* && cp -a $0/. /var",
                                              pristine};
    run(restore), run({"strace", "-f", "-qq", "-o", pristine + ".trace", TZLINKS_BINARY});
    std::set<std::string> expected;
    settle({}, &expected);
    auto reference = snapshot();
    std::ifstream trace(pristine + ".trace");
    std::map<std::string, int> seen;
    bool started = false;
    counts c;
    std::smatch call;
    const std::regex line("^[0-9]+ +([a-z0-9_]+)\\((.*)\\) += ");
    for (std::string text; std::getline(trace, text);) {
        if (!std::regex_search(text, call, line))
            continue;
        std::string name = call[1], when = std::to_string(++seen[name]), args = call[2];
        started = started || args.find("/var/db/timezone") != std::string::npos;
        if (!started || (name == "write" && args.compare(0, 2, "2,") == 0))
            continue; // the loader's calls, and the warnings' own writes
        bool changes = name == "unlink" || name == "symlink" || name == "rmdir" ||
                       name == "ftruncate" || name == "write" ||
                       args.find("O_CREAT") != std::string::npos;
        for (size_t at = 0; (at = failures.find(" " + name + ":", at)) != std::string::npos;) {
            at += name.size() + 2;
            std::string error = failures.substr(at, failures.find(' ', at) - at);
            run(restore), inject(name + ":error=" + error + ":when=" + when, expected, c);
        }
        if (changes && name != "write" && name != "ftruncate")
            run(restore), inject(name + ":error=EROFS:when=" + when + "+", expected, c);
        if (changes)
            run(restore), cut(name + ":signal=KILL:when=" + when, expected, reference, c);
    }
    std::cout << "FAULTS injected " << c.injected << " lasting " << c.lasting << " cuts " << c.cuts
              << " same " << c.same << " different " << c.different << " broken " << c.broken;
    for (const auto& [status, count] : c.statuses)
        std::cout << " status" << status << " " << count;
    std::cout << "\n";
}
