// SPDX-License-Identifier: Apache-2.0
// The fault and power-cut mode: with TZLINKS_FAULTS set, every end-to-end
// row marked faults also runs tzlinks again and again from its tree, with strace failing
// each call it makes on the file system in turn (once; a change of the
// tree also from then on, as on a file system turning read-only), and
// killing it on entry to each call that changes the tree. Each run must
// end with status 0, or with errno after the last resort's message, and
// write nothing but the tool's own warnings (no crash report of the C++
// run time or a sanitizer); settled by clean runs, the device must then be
// no worse than after an uninterrupted run, as tzlinks-status judges, but
// for the lasting states that the README documents. A cut ends
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
const std::multimap<std::string, std::string> failures = {
    {"openat", "EACCES"}, {"openat", "ENOENT"}, {"read", "EIO"},        {"write", "ENOSPC"},
    {"close", "EIO"},     {"fstat", "EIO"},     {"newfstatat", "EIO"},  {"getdents64", "EIO"},
    {"access", "EACCES"}, {"readlink", "EIO"},  {"readlink", "ENOENT"}, {"unlink", "EROFS"},
    {"unlink", "ENOENT"}, {"symlink", "EROFS"}, {"rmdir", "EROFS"},     {"ftruncate", "EIO"}};
const std::set<std::string> lasting = {"icutz-stale", "icutz-missing", "icutz-with-system"};

// What a row's runs share: the command that restores its pristine tree,
// the findings of an uninterrupted run, the tree it leaves, the counts.
std::string restore;
std::set<std::string> expected;
std::map<std::string, std::string> reference;
std::map<std::string, int> counts;

// Two clean runs settle the tree (after an update older than the system
// data was adopted, the next run still resets to the system data); then
// what tzlinks-status finds wrong, notes aside, beyond what is expected:
// 0 nothing, 1 only lasting states, 2 more.
int
settle(std::set<std::string>* found = nullptr)
{
    run(tzlinks()), run(tzlinks());
    std::string report = run(TZLINKS_STATUS_BINARY " --json").out;
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

// One run from the pristine tree, failing a call or, for a cut, killed.
void
attempt(const std::string& how)
{
    run(restore);
    outcome o = run(tzlinks(how));
    bool cut = how.find(":signal=KILL") != std::string::npos;
    std::string line, last, resort = "tzlinks: Last resort force_system_dataset() failed: ";
    for (std::istringstream lines(o.err); std::getline(lines, line); last = line)
        EXPECT_EQ(line.compare(0, 9, "tzlinks: "), 0) << how << ": not its own message: " << line;
    EXPECT_TRUE(cut ? o.status == 128 + 9
                    : o.status == 0 || last == resort + strerror(o.status) ||
                          (o.status == 255 && last.compare(0, resort.size(), resort) == 0))
        << how << ": exit status " << o.status;
    int worse = settle();
    EXPECT_NE(worse, 2) << how << ": the device is worse than without the failure";
    if (!cut) {
        ++counts["injected"], counts["lasting"] += worse == 1;
        return;
    }
    auto settled = snapshot();
    run(tzlinks());
    EXPECT_EQ(snapshot(), settled) << how << ": a later run changed the tree again";
    ++counts["cuts"], ++counts[worse == 2 ? "broken" : settled == reference ? "same" : "different"];
}

} // namespace

void
try_faults(const std::string& pristine)
{
    restore = "rm -rf /var/* && cp -a " + pristine + "/. /var", expected.clear(), counts.clear();
    run(restore), run(tzlinks("", pristine + ".trace"));
    settle(&expected);
    reference = snapshot();
    const std::regex changing("unlink|symlink|rmdir|ftruncate|write");
    for (const auto& [name, when, args] : calls_in(pristine + ".trace")) {
        bool changes =
            args.find("O_CREAT") != std::string::npos || std::regex_match(name, changing);
        for (auto [f, end] = failures.equal_range(name); f != end; ++f)
            attempt(name + ":error=" + f->second + ":when=" + when);
        if (changes && name != "write" && name != "ftruncate")
            attempt(name + ":error=EROFS:when=" + when + "+");
        if (changes)
            attempt(name + ":signal=KILL:when=" + when);
    }
    std::cout << "FAULTS";
    for (const char* count : {"injected", "lasting", "cuts", "same", "different", "broken"})
        std::cout << " " << count << " " << counts[count];
    std::cout << "\n";
}

std::vector<traced_call>
calls_in(const std::string& trace)
{
    std::ifstream in(trace);
    std::map<std::string, int> seen;
    std::vector<traced_call> calls;
    bool started = false;
    std::smatch call;
    const std::regex line("^[0-9]+ +([a-z0-9_]+)\\((.*)\\) += ");
    for (std::string text; std::getline(in, text);) {
        if (!std::regex_search(text, call, line))
            continue;
        std::string name = call[1], when = std::to_string(++seen[name]), args = call[2];
        started = started || args.find("/var/db/timezone") != std::string::npos;
        bool message =
            name == "write" && (args.compare(0, 2, "1,") == 0 || args.compare(0, 2, "2,") == 0);
        if (started && !message) // not the loader's calls, nor the messages' own writes
            calls.push_back({name, when, args});
    }
    return calls;
}
