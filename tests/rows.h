// The end-to-end rows of tests/tool.rows, whose format that file describes.
#ifndef TZLINKS_TESTS_ROWS_H
#define TZLINKS_TESTS_ROWS_H

#include <map>
#include <string>
#include <vector>

struct row {
    std::string name;
    std::string inject; // strace's inject= expression, or empty
    std::string tree;   // shell commands
    std::vector<std::string> changes;
    int exit = 0;
    std::string err;    // standard error, as warn(3) writes it
    std::string report; // expected health and findings of tzlinks-status
};

std::vector<row> load_rows();
// \s a space, \n a line end, \*N:c the character c N times.
std::string unescape(const std::string& text);
// What changed between two snapshots, in the rows' notation.
std::vector<std::string> changes(const std::map<std::string, std::string>& before,
                                 const std::map<std::string, std::string>& after);

#endif
