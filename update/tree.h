// SPDX-License-Identifier: Apache-2.0
#ifndef TZLINKS_UPDATE_TREE_H
#define TZLINKS_UPDATE_TREE_H

#include <string>
#include <vector>

// The names in a directory, but for "." and "..".
std::vector<std::string> names_in(int dir);
// Copies what is below from into the empty directory to: directories,
// regular files with their permission bits, and links as they are. Warns
// and stops at the first failure.
bool copy_into(int from, int to);
// Whether two trees hold the same names, kinds, bytes and link targets.
bool same_content(int a, int b);
// Removes name below dir, and everything below it; true when it is gone.
bool remove_all(int dir, const std::string& name);

#endif
