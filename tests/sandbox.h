// The tests' private world: a user and mount namespace in which empty tmpfs
// mounts hide the host's /var and /usr/share, so that programs working on
// the tool's fixed paths run for real without touching the host.
#ifndef TZLINKS_TESTS_SANDBOX_H
#define TZLINKS_TESTS_SANDBOX_H

#include <map>
#include <string>
#include <vector>

// Enters the namespace; returns why it could not, or "". Must run before
// anything starts a thread.
std::string enter_sandbox();
// What enter_sandbox returned: tests that need the sandbox skip with it.
extern std::string sandbox_refused;
// Puts empty file systems over /var and /usr/share; false when refused.
bool fresh_tree();
// Runs the sample-tree builders (tools/sample-tree.sh) on the fixed paths.
bool build_tree(const std::string& commands);

struct outcome {
    int status; // exit status, or 128 + the signal that ended it
    std::string out, err;
};
// Runs a program, killed after a second (a minute under $TZLINKS_RUNNER).
outcome run(std::vector<std::string> argv);
// The words that start a program of the project: those of $TZLINKS_RUNNER
// (an emulator, or valgrind), then the program's path.
std::vector<std::string> program(const std::string& path);

// Every entry below /var and /usr/share, by path: "->target" for a link,
// "=content" for a file, "/" for a directory, "|" for anything else; with
// change times, so that even a rewrite with the same content shows.
std::map<std::string, std::string> snapshot(bool with_times = false);

#endif
