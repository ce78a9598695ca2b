// SPDX-License-Identifier: Apache-2.0
// What the command lines of tzlinks-status and tzlinks-update share: long
// options by their exact names, usage errors said one way, and a status
// that tells whether the output got out.
#ifndef TZLINKS_DEVICE_COMMAND_LINE_H
#define TZLINKS_DEVICE_COMMAND_LINE_H

#include <getopt.h>
#include <map>
#include <string>

// A long option: without a value, with one, or with one that may be left out.
constexpr option
flag(const char* name) noexcept
{
    return {name, no_argument, nullptr, 0};
}
constexpr option
valued(const char* name) noexcept
{
    return {name, required_argument, nullptr, 0};
}
constexpr option
maybe_valued(const char* name) noexcept
{
    return {name, optional_argument, nullptr, 0};
}

// Says what is wrong with the word and how the program is used: EX_USAGE.
int usage_error(const char* usage, const char* why, const std::string& word);
// status, once what was written to standard output has got there; else
// EX_IOERR, a report that cannot be written being an error of its own.
int written(int status);
// Reads the options of argv into given, by name, with their values ("" for
// none): 0, or EX_USAGE, said, for an option that is unknown or abbreviated,
// given twice, or missing its value. Operands are left from optind on.
int read_options(int argc, char** argv, const option* options, const char* usage,
                 std::map<std::string, std::string>& given);

#endif
