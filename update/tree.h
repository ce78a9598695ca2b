// SPDX-License-Identifier: Apache-2.0
// Whole directory trees, each below a directory descriptor: listed,
// compared and removed without ever following a link.
#ifndef TZLINKS_UPDATE_TREE_H
#define TZLINKS_UPDATE_TREE_H

#include <string>
#include <vector>

// Whether two trees hold the same names, kinds, modes, bytes and link
// targets: 1 the same, 0 not, -1 when one could not be read (errno).
int same_content(int a, int b);
// Removes name below dir and everything below it, on dir's file system
// only, however deep: 0, or the errno of the first removal that failed,
// whose path below dir goes into failed (a mount point is left: EBUSY).
int remove_all(int dir, const std::string& name, std::string* failed = nullptr);

#endif
