// SPDX-License-Identifier: Apache-2.0
// tzlinks-status: says which time-zone data a device (or an image of one)
// uses, what its next boot will do, what is wrong and how to repair it;
// changes nothing.
#include "device/command_line.h"
#include "device/device.h"
#include "status/report.h"

#include <cstdio>
#include <cstring>
#include <err.h>
#include <sysexits.h>

static const option options[] = {flag("json"),
                                 flag("commands"),
                                 maybe_valued("metrics"),
                                 valued("root"),
                                 flag("help"),
                                 flag("version"),
                                 {}};
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

static const char* const forms[] = {"json", "commands", "metrics"};

// The form asked for, text when none: at most one.
static int
form_of(int argc, char** argv, std::string& form)
{
    for (int i = 1; i < argc; ++i) {
        for (const char* name : forms) {
            if (strncmp(argv[i], "--", 2) != 0 || strncmp(argv[i] + 2, name, strlen(name)) != 0)
                continue;
            if (!form.empty())
                return usage_error(usage, "given with another form", argv[i]);
            form = name;
        }
    }
    return 0;
}

// A script with nothing in it, where findings need what only a person can
// supply, says so where the person looks, or an empty script passes for
// a repair.
static void
needs_only(const std::string& form, const velm_report& report)
{
    size_t needs = 0, commands = 0;
    for (const velm_finding& finding : report.findings) {
        needs += !finding.manual.empty();
        commands += finding.commands && !finding.commands->empty();
    }
    if (form == "commands" && commands == 0 && needs != 0)
        warnx("no command to run: %zu finding%s need%s what only a person can supply (see "
              "\"Needs:\" in the report)",
              needs, needs == 1 ? "" : "s", needs == 1 ? "s" : "");
}

int
main(int argc, char** argv)
{
    std::map<std::string, std::string> given;
    std::string form;
    if (int status = read_options(argc, argv, options, usage, given); status != 0)
        return status;
    if (given.count("help") != 0) {
        (void)fputs(usage, stdout);
        (void)fputs(help, stdout);
        return written(0);
    }
    if (given.count("version") != 0) {
        (void)printf("tzlinks-status %s\n", TZLINKS_VERSION);
        return written(0);
    }
    if (optind < argc)
        return usage_error(usage, "unknown argument", argv[optind]);
    if (int status = form_of(argc, argv, form); status != 0)
        return status;
    velm_device device;
    auto root = given.find("root");
    if (int status = open_device(root != given.end() ? root->second.c_str() : nullptr, device);
        status != 0)
        return status;
    velm_simulation tree(device.fd);
    velm_report report = make_report(tree, device);
    // Scripts and metrics are written whatever the health: it is inside them.
    if (form == "metrics" && !given["metrics"].empty())
        return write_metrics(given["metrics"], metrics_report(report)) ? 0 : EX_IOERR;
    (void)fputs((form == "json"       ? json_report(report)
                 : form == "commands" ? commands_report(report)
                 : form == "metrics"  ? metrics_report(report)
                                      : text_report(report))
                    .c_str(),
                stdout);
    if (form == "commands" || form == "metrics") {
        needs_only(form, report);
        return written(0);
    }
    return written(report.health == "healthy" ? 0 : report.health == "degraded" ? 1 : 2);
}
