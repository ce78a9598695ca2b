// SPDX-License-Identifier: Apache-2.0
#ifndef TZLINKS_DATASET_FIRST_WORD_H
#define TZLINKS_DATASET_FIRST_WORD_H

#include <string>

// Replaces target with the first white-space separated word of the file at
// path, read the way `stream >> string` reads it in the classic locale.
// A file that cannot be opened or holds no word leaves target unchanged;
// nothing is reported. Reading stops once the word is longer than keep
// bytes, and so does the word: a word nobody uses need not be held whole.
void read_first_word(const std::string& path, std::string& target, size_t keep = std::string::npos);

// The same word, read from the descriptor fd (a regular file's): 0, or the
// errno of a read that failed, when the word may be cut short.
int first_word_of(int fd, std::string& word, size_t keep = std::string::npos);

#endif
