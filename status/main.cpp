// SPDX-License-Identifier: Apache-2.0
// tzlinks-status: says which time-zone data a device (or an image of one)
// uses, what its next boot will do, and what is wrong; changes nothing.
#include "status/report.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <err.h>
#include <fcntl.h>
#include <string>

static const char usage[] = "usage: tzlinks-status [--json] [--root DIR]\n"
                            "       tzlinks-status --help | --version\n";
static const char help[] =
    "Reports which time-zone data a device uses, what its next boot will do and what\n"
    "is wrong, without changing anything.\n"
    "  --json      one JSON object instead of text\n"
    "  --root DIR  the tree below DIR (an image, a copy) instead of the device's own\n"
    "Exit status: 0 healthy, 1 degraded, 2 broken, 64 usage, 66 DIR unreadable,\n"
    "74 the report could not be written. See tzlinks-status(8).\n";

static int
usage_error(const char* why, const std::string& word)
{
    warnx("%s: %s", why, word.c_str());
    (void)fputs(usage, stderr);
    return 64;
}

// What was written to standard output must have got there: a report that
// cannot be written is an error of its own.
static int
written(int status)
{
    if (fflush(stdout) == 0 && ferror(stdout) == 0)
        return status;
    warn("cannot write the report");
    return 74;
}

int
main(int argc, char** argv)
{
    bool as_json = false;
    std::string root = "/";
    for (int i = 1; i < argc; ++i) {
        std::string word = argv[i];
        if (word == "--json") {
            as_json = true;
        } else if (word == "--root" && i + 1 < argc) {
            root = argv[++i];
        } else if (word.compare(0, 7, "--root=") == 0) {
            root = word.substr(7);
        } else if (word == "--help") {
            (void)fputs(usage, stdout);
            (void)fputs(help, stdout);
            return written(0);
        } else if (word == "--version") {
            (void)printf("tzlinks-status %s\n", TZLINKS_VERSION);
            return written(0);
        } else {
            return usage_error(word == "--root" ? "missing directory after" : "unknown argument",
                               word);
        }
    }
    int root_fd = open(root.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (root_fd < 0) {
        warn("cannot read %s", root.c_str());
        return 66;
    }
    velm_simulation tree(root_fd);
    velm_report report = make_report(tree);
    (void)fputs((as_json ? json_report(report) : text_report(report)).c_str(), stdout);
    return written(report.health == "healthy" ? 0 : report.health == "degraded" ? 1 : 2);
}
