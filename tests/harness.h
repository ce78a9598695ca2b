// SPDX-License-Identifier: Apache-2.0
// The test harness: in the private user and mount namespace that CTest
// starts the tests in, empty tmpfs mounts hide the host's /var and
// /usr/share, so that the real programs run on the fixed paths without
// touching the host; and the rows of tests/tool.rows, whose format that
// file describes.
#ifndef TZLINKS_TESTS_HARNESS_H
#define TZLINKS_TESTS_HARNESS_H

#include <map>
#include <nlohmann/json.hpp>
#include <ostream>
#include <string>
#include <vector>

// Puts empty file systems over /var, /usr/share and /dev/shm (the tests'
// scratch), and one over /etc that keeps the host's files but none of the
// changes; false when refused,
// and always outside a user namespace of the tests' own.
bool fresh_tree();
// Runs the sample-tree builders (tools/sample-tree.sh) on the fixed paths.
bool build_tree(const std::string& commands);

struct outcome {
    int status; // exit status, or 128 + the signal that ended it
    std::string out, err;
    long max_rss;   // KiB, at most, of the program
    double seconds; // of wall time
};
// Runs a shell command, killed after ten seconds (a minute under
// $TZLINKS_RUNNER).
outcome run(const std::string& command);
// The command that starts a program of the project in place of the shell,
// through $TZLINKS_RUNNER (an emulator, or valgrind), with arguments; both
// programs without the capabilities drop names (setpriv's list), if any.
std::string program(const std::string& path, const std::string& args = "");
void drop_capabilities(const std::string& drop);
// What puts tzlinks-update on PATH, as the repairs' commands call it,
// through $TZLINKS_RUNNER.
std::string update_on_path();
// The same for tzlinks, under strace failing calls as inject says (its
// inject= expression) or writing its trace to a file when either is not
// empty; leak checks cannot run under ptrace.
std::string tzlinks(const std::string& inject = "", const std::string& trace = "");

// What in JSON reports of tzlinks-status breaks its schema, as Debian's
// python3-jsonschema says it; nothing when they keep to it. (Checked in a
// plain build: the others write the very same reports.)
std::string schema_breaks(const std::vector<std::string>& reports);

// The ids of a report's findings, in order.
std::vector<std::string> ids(const nlohmann::json& report, const char* list = "findings");
// The texts of a JSON array joined.
std::string joined(const nlohmann::json& texts, const std::string& between = ",");

// Every entry below /var and /usr/share, by path: "->target" for a link,
// "=content" for a file, "/" for a directory, "|" for anything else; with
// change times, so that even a rewrite with the same content shows.
std::map<std::string, std::string> snapshot(bool with_times = false);

struct row {
    std::string name, inject, caps, tree, health, err; // err: as warn(3) writes it
    std::string args, expect;                          // of tzlinks-update
    std::vector<std::string> changes;
    int exit = 0;
    bool local = false;  // a tree no copy can stand for (its mounts)
    bool faults = false; // run in the fault and power-cut mode too
};
// A row's device: a fresh tree with the system data 2023c, /etc/localtime
// through the boot's link, and what the row builds; its capabilities set.
bool set_up(const row& r);
// The rows of tests/TABLE: tool.rows, or update.rows.
std::vector<row> load_rows(const std::string& table);
// The fault and power-cut runs of a row, from its tree kept at pristine.
void try_faults(const std::string& pristine);
// The calls a trace (strace -f -o) holds from the first that names
// /var/db/timezone on, but for the writes of messages (to 1 or 2): each
// with its name, which of the calls of that name it is, and its arguments.
struct traced_call {
    std::string name, when, args;
};
std::vector<traced_call> calls_in(const std::string& trace);
// What changed between two snapshots, in the rows' notation.
std::vector<std::string> changes(std::map<std::string, std::string> before,
                                 const std::map<std::string, std::string>& after);

#endif
