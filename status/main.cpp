// SPDX-License-Identifier: Apache-2.0
// tzlinks-status: says which time-zone data a device (or an image of one)
// uses, what its next boot will do, what is wrong and how to repair it;
// changes nothing.
#include "status/command_line.h"
#include "status/report.h"

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <err.h>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

static const char usage[] =
    "usage: tzlinks-status [--json | --commands | --metrics[=DIR]] [--root DIR]\n"
    "       tzlinks-status --help | --version\n";
static const char help[] =
    "Reports which time-zone data a device uses, what its next boot will do, what\n"
    "is wrong and the commands that repair it, without changing anything.\n"
    "  --json      one JSON object instead of text\n"
    "  --commands  only the repairs' commands, a line each, to run in order as root\n"
    "  --metrics   the report as Prometheus metrics; =DIR: into DIR/tzlinks.prom\n"
    "  --root DIR  the tree below DIR (an image, a copy) instead of the device's own\n"
    "Exit status: 0 healthy, 1 degraded, 2 broken, 64 usage, 66 DIR unreadable or\n"
    "no device tree, 74 the report could not be written. See tzlinks-status(8).\n";

// Whether DIR holds what a device tree holds: without var/ and usr/share/
// the report would describe nothing but absences.
static bool
device_tree(int root)
{
    struct stat st;
    return fstatat(root, "var", &st, 0) == 0 && S_ISDIR(st.st_mode) &&
           fstatat(root, "usr/share", &st, 0) == 0 && S_ISDIR(st.st_mode);
}

int
main(int argc, char** argv)
{
    const char* form = nullptr; // --json or --commands; text when none
    const char* root = nullptr;
    for (int i = 1; i < argc; ++i) {
        std::string word = argv[i];
        if (word == "--json" || word == "--commands" || word.compare(0, 9, "--metrics") == 0) {
            if (form != nullptr)
                return usage_error(usage, word == form ? "given twice" : "given with another form",
                                   word);
            form = argv[i];
        } else if ((word == "--root" && i + 1 < argc) || word.compare(0, 7, "--root=") == 0) {
            if (root != nullptr)
                return usage_error(usage, "given twice", "--root");
            root = word == "--root" ? argv[++i] : argv[i] + 7;
        } else if (word == "--help" || word == "-h") {
            (void)fputs(usage, stdout);
            (void)fputs(help, stdout);
            return written(0);
        } else if (word == "--version") {
            (void)printf("tzlinks-status %s\n", TZLINKS_VERSION);
            return written(0);
        } else {
            return usage_error(
                usage, word == "--root" ? "missing directory after" : "unknown argument", word);
        }
    }
    int root_fd = open(root ? root : "/", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (root_fd < 0) {
        warn("cannot read %s", root ? root : "/");
        return 66;
    }
    if (root != nullptr && !device_tree(root_fd)) {
        warnx("%s holds no device tree: it lacks var/ or usr/share/", root);
        return 66;
    }
    // Commands name the tree's paths below DIR, however DIR was given.
    char real[PATH_MAX];
    std::string prefix = root != nullptr && realpath(root, real) != nullptr ? real : "";
    if (prefix == "/")
        prefix.clear();
    velm_simulation tree(root_fd);
    velm_report report = make_report(tree, prefix);
    std::string form_ = form == nullptr ? "" : form;
    // Scripts and metrics are written whatever the health: it is inside them.
    if (form_.compare(0, 10, "--metrics=") == 0)
        return write_metrics(form_.substr(10), metrics_report(report)) ? 0 : 74;
    (void)fputs((form_ == "--json"       ? json_report(report)
                 : form_ == "--commands" ? commands_report(report)
                 : form_ == "--metrics"  ? metrics_report(report)
                                         : text_report(report))
                    .c_str(),
                stdout);
    if (form_ == "--commands" || form_ == "--metrics")
        return written(0);
    return written(report.health == "healthy" ? 0 : report.health == "degraded" ? 1 : 2);
}
