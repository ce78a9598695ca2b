// What the code under test writes through warn(3), captured in memory so a
// fuzz target can both keep libFuzzer's output readable and check the exact
// warnings each input produced.
#ifndef TZLINKS_TESTS_FUZZ_CAPTURED_WARNINGS_H
#define TZLINKS_TESTS_FUZZ_CAPTURED_WARNINGS_H

#include <string>

// Points the stdio stream stderr, which warn(3) writes to, at an in-memory
// buffer. libFuzzer keeps the stream it captured at start-up and the
// sanitizers write to file descriptor 2, so their reports still reach the
// terminal. Call once, from LLVMFuzzerInitialize.
void capture_warnings();

// The warnings written since the last call, and clears the buffer.
std::string take_warnings();

// "tzlinks_fuzz: MESSAGE: " as warn(3) begins a line for MESSAGE.
std::string warning_start(const std::string& message);

// Aborts with what and the input rendered printable when condition fails,
// so libFuzzer records the input as a crash.
void fuzz_require(bool condition, const char* what, const std::string& input);

#endif
