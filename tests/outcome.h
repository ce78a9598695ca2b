// Runs a piece of the system in this process and records what it left on
// standard error and what, if anything, it threw.
#ifndef TZLINKS_TESTS_OUTCOME_H
#define TZLINKS_TESTS_OUTCOME_H

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <typeinfo>

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

#endif
