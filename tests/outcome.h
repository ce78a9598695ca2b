// Runs a piece of the system in this process and records what it left on
// standard error and what, if anything, it threw.
#ifndef TZLINKS_TESTS_OUTCOME_H
#define TZLINKS_TESTS_OUTCOME_H

#include <gtest/gtest.h>

#include <functional>
#include <stdexcept>
#include <string>
#include <vector>

struct outcome {
    std::string err;    // everything written to standard error
    std::string thrown; // "" when nothing escaped; else "int 22", "invalid_argument: badpath"
};

template <class F>
outcome
observe(F&& call)
{
    outcome result;
    testing::internal::CaptureStderr();
    try {
        call();
    } catch (int value) {
        result.thrown = "int " + std::to_string(value);
    } catch (const std::invalid_argument& e) {
        result.thrown = std::string("invalid_argument: ") + e.what();
    } catch (const std::out_of_range&) {
        result.thrown = "out_of_range";
    } catch (...) {
        result.thrown = "something else";
    }
    result.err = testing::internal::GetCapturedStderr();
    return result;
}

// One expected warning: the message and the errno whose text follows it.
struct warned {
    std::string message;
    int errnum;
};

// A row of the in-process tables: build a tree, call something, compare
// what it returned, wrote and threw, and what the tree holds afterwards.
struct call_row {
    std::string name;
    std::string tree; // sample-tree commands (see tools/sample-tree.sh)
    std::function<std::string()> call;
    std::string result;
    std::vector<warned> warnings;
    std::string thrown;
    std::string path = ""; // an entry to describe afterwards, if any
    std::string after = "";
};

void PrintTo(const call_row& row, std::ostream* os);
// Runs the row in the sandbox and checks every expectation.
void check_call_row(const call_row& row);

#endif
