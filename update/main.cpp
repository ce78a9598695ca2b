// SPDX-License-Identifier: Apache-2.0
// tzlinks-update: stages an update on a device, after checking it with the
// boot's own code, and prunes the updates nothing names any more.
#include "update/update.h"

#include "status/command_line.h"

#include "support/version.h"

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <err.h>
#include <fcntl.h>
#include <map>
#include <string>
#include <sys/stat.h>
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

// The options each command takes, and whether each takes a value.
struct velm_option {
    const char *command, *name;
    bool value;
};
static const velm_option options[] = {
    {"check", "--as", true},   {"check", "--json", false},    {"check", "--root", true},
    {"stage", "--as", true},   {"stage", "--force", false},   {"stage", "--wait", true},
    {"stage", "--root", true}, {"prune", "--dry-run", false}, {"prune", "--wait", true},
    {"prune", "--root", true},
};

static const velm_option*
option_of(const std::string& command, const std::string& word)
{
    for (const velm_option& option : options) {
        if (command == option.command && word == option.name)
            return &option;
    }
    return nullptr;
}

// How long to wait for the lock: --wait's seconds, checked when given.
static int
seconds_to_wait(const std::map<std::string, std::string>& given)
{
    auto wait = given.find("--wait");
    return wait == given.end() ? 60 : std::stoi(wait->second);
}

static int
open_device(const std::map<std::string, std::string>& given, velm_device& device)
{
    auto root = given.find("--root");
    const char* path = root == given.end() ? "/" : root->second.c_str();
    device.fd = open(path, O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    struct stat st;
    if (device.fd < 0) {
        warn("cannot read %s", path);
        return 66;
    }
    if (root != given.end() && (fstatat(device.fd, "var", &st, 0) != 0 || !S_ISDIR(st.st_mode))) {
        warnx("%s holds no device tree: no var/ below it", path);
        return 66;
    }
    char real[PATH_MAX];
    device.root = root != given.end() && realpath(path, real) != nullptr ? real : "";
    if (device.root == "/")
        device.root.clear();
    return 0;
}

// check and stage: SRC judged; stage then places it unless refused.
static int
check_or_stage(const std::string& command, const std::string& name,
               const std::map<std::string, std::string>& given, const velm_device& device)
{
    int src = open(name.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (src < 0) {
        warn("cannot read %s", name.c_str());
        return 66;
    }
    auto as = given.find("--as");
    std::string release = source_release(src);
    std::string version = as != given.end() ? as->second : release.empty() ? "" : release + ".1.0";
    if (command == "stage") {
        int status = take_lock(device, seconds_to_wait(given));
        if (status != 0)
            return status;
    }
    // A name that is no version is never a path below tz/ either.
    velm_judgement j;
    if (velm_version_match_text(version).size == 5)
        j = judge(device, src, name, version);
    else
        j.version = version, j.problems = examine_source(src, name, version, "");
    bool forced = given.count("--force") != 0;
    bool unusable = false;
    for (const velm_finding& problem : j.problems)
        unusable = unusable || problem.severity == "error";
    if (command == "check" || unusable || (j.verdict == refused && !forced)) {
        (void)fputs((given.count("--json") != 0 ? judgement_json(j, name, device)
                                                : judgement_text(j, name, device))
                        .c_str(),
                    stdout);
        return written(command == "check" ? j.verdict : refused);
    }
    int status = stage(device, src, version);
    if (status == 0) {
        velm_simulation tree(device.fd);
        (void)fputs(("Next boot\n" + text_run(make_report(tree, device.root).next_boot)).c_str(),
                    stdout);
    }
    return written(status);
}

int
main(int argc, char** argv)
{
    std::string command = argc > 1 ? argv[1] : "";
    if (command == "--help" || command == "-h" || command == "--version") {
        (void)printf("%s", command == "--version" ? "tzlinks-update " TZLINKS_VERSION "\n" : usage);
        if (command != "--version")
            (void)fputs(help, stdout);
        return written(0);
    }
    if (command != "check" && command != "stage" && command != "prune")
        return usage_error(usage, command.empty() ? "missing command" : "unknown command", command);
    std::map<std::string, std::string> given;
    std::string source;
    for (int i = 2; i < argc; ++i) {
        std::string word = argv[i];
        const velm_option* option = option_of(command, word);
        if (word == "--help" || word == "-h") {
            (void)fputs(usage, stdout);
            (void)fputs(help, stdout);
            return written(0);
        } else if (option != nullptr) {
            if (given.count(word) != 0)
                return usage_error(usage, "given twice", word);
            if (option->value && i + 1 == argc)
                return usage_error(usage, "missing value after", word);
            given[word] = option->value ? argv[++i] : "";
            const std::string& value = given[word];
            if (word == "--wait" && (value.empty() || value.size() > 5 ||
                                     value.find_first_not_of("0123456789") != std::string::npos))
                return usage_error(usage, "not a number of seconds", value);
        } else if (word[0] != '-' && command != "prune" && source.empty()) {
            source = word;
        } else {
            return usage_error(usage, "unknown argument", word);
        }
    }
    if (command != "prune" && source.empty())
        return usage_error(usage, "missing SRC for", command);
    velm_device device;
    if (int status = open_device(given, device); status != 0)
        return status;
    if (command != "prune")
        return check_or_stage(command, source, given, device);
    int status = take_lock(device, seconds_to_wait(given));
    return written(status != 0 ? status : prune(device, given.count("--dry-run") != 0));
}
