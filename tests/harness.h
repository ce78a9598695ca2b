// The test harness: a private user and mount namespace in which empty
// tmpfs mounts hide the host's /var and /usr/share, so that the real
// programs run on the fixed paths without touching the host; and the rows
// of tests/tool.rows, whose format that file describes.
#ifndef TZLINKS_TESTS_HARNESS_H
#define TZLINKS_TESTS_HARNESS_H

#include <map>
#include <string>
#include <vector>

// Why the namespace could not be entered, or "": tests that need it skip.
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
// A program of the project, started through $TZLINKS_RUNNER's words (an
// emulator, or valgrind), with arguments.
std::vector<std::string> program(const std::string& path, std::vector<std::string> args = {});
// tzlinks, under strace failing calls as inject says (its inject= expression)
// when that is not empty; leak checks cannot run under ptrace.
std::vector<std::string> tzlinks(const std::string& inject = "");

// Every entry below /var and /usr/share, by path: "->target" for a link,
// "=content" for a file, "/" for a directory, "|" for anything else; with
// change times, so that even a rewrite with the same content shows.
std::map<std::string, std::string> snapshot(bool with_times = false);

struct row {
    std::string name, inject, tree, health, err; // err: as warn(3) writes it
    std::vector<std::string> changes;
    int exit = 0;
};
std::vector<row> load_rows();
// The fault and power-cut runs of a row, from its tree kept at pristine.
void try_faults(const std::string& pristine);
// \s a space, \n a line end, \*N:c the character c N times.
std::string unescape(const std::string& text);
// What changed between two snapshots, in the rows' notation.
std::vector<std::string> changes(std::map<std::string, std::string> before,
                                 const std::map<std::string, std::string>& after);

#endif
