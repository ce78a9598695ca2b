// SPDX-License-Identifier: Apache-2.0
// What the command lines of tzlinks-status and tzlinks-update share.
#ifndef TZLINKS_STATUS_COMMAND_LINE_H
#define TZLINKS_STATUS_COMMAND_LINE_H

#include <string>

// Says what is wrong with the word and how the program is used: 64.
int usage_error(const char* usage, const char* why, const std::string& word);
// status, once what was written to standard output has got there; else
// 74, a report that cannot be written being an error of its own.
int written(int status);

#endif
