// SPDX-License-Identifier: Apache-2.0
// tzlinks-update: stages an update on a device, after checking it with the
// boot's own code, and prunes the updates nothing names any more.
#include "update/tree.h"
#include "update/update.h"

#include "dataset/dataset.h"
#include "device/command_line.h"
#include "device/text.h"
#include "support/paths.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <err.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sysexits.h>
#include <unistd.h>

static const char usage[] =
    "usage: tzlinks-update check SRC [--as V] [--json] [--root DIR]\n"
    "       tzlinks-update stage SRC [--as V] [--force] [--wait SECONDS] [--root DIR]\n"
    "       tzlinks-update prune [--dry-run] [--wait SECONDS] [--root DIR]\n"
    "       tzlinks-update --help | --version\n";
static const char help[] =
    "Puts a time-zone update on a device the way its next boot adopts it.\n"
    "  check  says what the next boot would make of SRC staged as V, changing nothing\n"
    "  stage  copies SRC to /var/db/timezone/tz/V and points tz_latest at it\n"
    "  prune  removes the updates no link names, and what a cut stage left\n"
    "SRC holds zoneinfo/ (with +VERSION) and icutz/; V is +VERSION's release .1.0.\n"
    "  --as V          the version to stage SRC as\n"
    "  --json          check's report as one JSON object\n"
    "  --force         stage what only the boot's judgement refuses\n"
    "  --dry-run       say what prune would remove\n"
    "  --wait SECONDS  wait so long for another tzlinks-update (60)\n"
    "  --root DIR      the device tree below DIR (an image, a copy)\n"
    "Exit status: 0 adopted, 1 adopted with warnings, 2 refused, 64 usage, 66 SRC or\n"
    "DIR unreadable, 74 a change failed, 75 locked. See tzlinks-update(8).\n";

static const option options[] = {valued("as"),   flag("json"),    flag("force"),
                                 valued("wait"), valued("root"),  flag("dry-run"),
                                 flag("help"),   flag("version"), {}};
// The commands, and the options each takes.
static const char* const commands[][2] = {
    {"check", " as json root "},
    {"stage", " as force wait root "},
    {"prune", " dry-run wait root "},
};

// The options given that the command does not take: a usage error.
static int
check_options(const std::string& command, const std::map<std::string, std::string>& given)
{
    for (const auto& [name, takes] : commands) {
        if (command != name)
            continue;
        for (const auto& [option, value] : given) {
            if (strstr(takes, (" " + option + " ").c_str()) == nullptr)
                return usage_error(usage, ("not an option of " + command).c_str(), "--" + option);
        }
        auto wait = given.find("wait");
        if (wait != given.end() &&
            (wait->second.size() > 5 ||
             wait->second.find_first_not_of("0123456789") != std::string::npos))
            return usage_error(usage, "not a number of seconds", wait->second);
        return 0;
    }
    return usage_error(usage, "unknown command, not check, stage or prune", command);
}

// A private directory to copy SRC into for check, removed at exit.
static std::string scratch;
static void
remove_scratch()
{
    size_t slash = scratch.rfind('/');
    int parent = open(scratch.substr(0, slash).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (parent >= 0)
        (void)remove_all(parent, scratch.substr(slash + 1)), (void)close(parent);
}

static int
check(const velm_device& device, int src, const std::string& name, const std::string& version,
      bool as_json)
{
    const char* tmp = getenv("TMPDIR");
    scratch = std::string(tmp != nullptr && *tmp != '\0' ? tmp : "/tmp") + "/tzlinks-update.XXXXXX";
    if (mkdtemp(scratch.data()) == nullptr) {
        warn("cannot make a directory to check %s in", shown(name).c_str());
        return EX_IOERR;
    }
    (void)atexit(remove_scratch);
    int copy = open(scratch.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    velm_judgement j;
    if (copy < 0 || copy_and_judge(device, src, copy, name, version, "", j) != 0)
        return EX_IOERR;
    (void)fputs((as_json ? judgement_json(j, name) : judgement_text(j, name)).c_str(), stdout);
    return written(j.verdict);
}

// Whether the directory fd lies at or below the directory top, going up
// by ".." as far as the root.
static bool
below(int fd, int top)
{
    struct stat target, st, up;
    int at = openat(fd, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    bool inside = false;
    for (int steps = 0; at >= 0 && !inside && steps < 4096 && fstat(top, &target) == 0; ++steps) {
        int parent =
            fstat(at, &st) == 0 ? openat(at, "..", O_RDONLY | O_DIRECTORY | O_CLOEXEC) : -1;
        inside = st.st_dev == target.st_dev && st.st_ino == target.st_ino;
        (void)close(at);
        at = parent;
        if (at >= 0 && fstat(at, &up) == 0 && up.st_dev == st.st_dev && up.st_ino == st.st_ino)
            break; // the root: ".." is itself
    }
    if (at >= 0)
        (void)close(at);
    return inside;
}

static int
run(const std::string& command, const std::string& source,
    const std::map<std::string, std::string>& given)
{
    velm_device device;
    auto root = given.find("root");
    if (int status = open_device(root != given.end() ? root->second.c_str() : nullptr, device);
        status != 0)
        return status;
    int src = -1;
    if (command != "prune" &&
        (src = open(source.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)) < 0) {
        warn("cannot read %s", shown(source).c_str());
        return EX_NOINPUT;
    }
    auto as = given.find("as");
    std::string release = src < 0 ? "" : source_release(src);
    std::string version = as != given.end() ? as->second
                          : release.empty() ? ""
                                            : velm_release_version(release);
    int links = device.open_directory(velm_path::link_directory);
    if (links < 0) {
        warn("cannot open %s", shown(device.root + velm_path::link_directory).c_str());
        return EX_IOERR;
    }
    // An update copied from inside the device, or from a tree that holds
    // it, would be copied into itself.
    if (src >= 0 && (below(src, links) || below(links, src))) {
        warnx("%s and %s lie one inside the other: an update comes from outside the device",
              shown(source).c_str(), shown(device.named(velm_path::link_directory)).c_str());
        return refused;
    }
    if (command == "check")
        return check(device, src, source, version, given.count("json") != 0);
    auto wait = given.find("wait");
    int seconds =
        wait == given.end() ? 60 : static_cast<int>(strtol(wait->second.c_str(), nullptr, 10));
    if (int status = take_lock(device, links, seconds, command == "prune"); status != 0)
        return status;
    int status = command == "prune"
                     ? prune(device, links, given.count("dry-run") != 0)
                     : stage(device, links, src, source, version, given.count("force") != 0);
    return written(status);
}

int
main(int argc, char** argv)
{
    std::map<std::string, std::string> given;
    if (int status = read_options(argc, argv, options, usage, given); status != 0)
        return status;
    if (given.count("help") != 0 || given.count("version") != 0) {
        (void)fputs(given.count("help") != 0 ? usage : "tzlinks-update " TZLINKS_VERSION "\n",
                    stdout);
        if (given.count("help") != 0)
            (void)fputs(help, stdout);
        return written(0);
    }
    if (optind == argc)
        return usage_error(usage, "missing command", "check, stage or prune");
    std::string command = argv[optind];
    if (int status = check_options(command, given); status != 0)
        return status;
    bool takes_source = command != "prune";
    if (takes_source && optind + 1 == argc)
        return usage_error(usage, "missing SRC for", command);
    if (optind + 1 + (takes_source ? 1 : 0) < argc)
        return usage_error(usage, "unknown argument", argv[optind + 1 + (takes_source ? 1 : 0)]);
    return run(command, takes_source ? argv[optind + 1] : "", given);
}
