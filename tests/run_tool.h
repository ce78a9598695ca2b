// Runs the real tzlinks binary as a child process and records what it did.
#ifndef TZLINKS_TESTS_RUN_TOOL_H
#define TZLINKS_TESTS_RUN_TOOL_H

#include <string>

struct tool_run {
    int status;      // exit status; 128 + signal number for a death by signal
    std::string out; // standard output (the tool writes none)
    std::string err; // standard error
};

// The binary is started through the words of $TZLINKS_RUNNER, when set
// (an emulator such as qemu-aarch64, or valgrind), so that the same
// scenarios check a cross build or a memory check.
tool_run run_tzlinks();

#endif
