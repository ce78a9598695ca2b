#ifndef TZLINKS_TESTS_OPERATIONS_H
#define TZLINKS_TESTS_OPERATIONS_H

#include <string>
#include <vector>

// Calls one operation of the system by name, as a table row spells it
// ("remove /var/x", "parse 2023c", "dataset /var/db/timezone/tz/2024a"),
// and returns what it returned as text. Whatever it throws escapes.
std::string perform(const std::vector<std::string>& call);

// Whether the operation touches the file system (and so needs a sandbox).
bool touches_files(const std::string& operation);

#endif
