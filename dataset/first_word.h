// SPDX-License-Identifier: Apache-2.0
#ifndef TZLINKS_DATASET_FIRST_WORD_H
#define TZLINKS_DATASET_FIRST_WORD_H

#include <string>

// Replaces target with the first white-space separated word of the file at
// path, read the way `stream >> string` reads it in the classic locale.
// A file that cannot be opened or holds no word leaves target unchanged;
// nothing is reported.
void read_first_word(const std::string& path, std::string& target);

#endif
