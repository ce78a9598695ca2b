// SPDX-License-Identifier: Apache-2.0
// Runs the rows of tests/update.rows: the real tzlinks-update on a sample
// device in the sandbox; with TZLINKS_FAULTS set, each stage and prune row
// again with every changing call failing once, and killed on entry to each:
// tz_latest must then name the update it named before or the whole new
// one, the device's links must be untouched, tzlinks-status must find no
// error that was not there, and the same command run again must complete.
#include "harness.h"

#include <gtest/gtest.h>
#include <iostream>
#include <nlohmann/json.hpp>
#include <regex>

namespace {

using nlohmann::json;

std::string
update(const std::string& args)
{
    return program(TZLINKS_UPDATE_BINARY, args);
}

// What a row's checks read: tz_latest's update and the names below tz/.
std::string
state()
{
    std::string latest = run("readlink /var/db/timezone/tz_latest").out;
    return "latest=" + (latest.empty() ? "-" : latest.substr(20, latest.size() - 21)) +
           " tz=" + run("ls -A /var/db/timezone/tz | paste -sd, | tr -d '\\n'").out;
}

// Of a state, what tz_latest names.
std::string
latest_of(const std::string& state)
{
    return state.substr(0, state.find(' '));
}

std::string
links()
{
    return run("cd /var/db/timezone && readlink zoneinfo icutz localtime").out;
}

// The ids of the errors tzlinks-status finds.
std::string
errors()
{
    std::string found;
    json report = json::parse(run(program(TZLINKS_STATUS_BINARY, "--json")).out);
    for (const json& f : report["findings"])
        found += f["severity"] == "error" ? f["id"].get<std::string>() + " " : "";
    return found;
}

// Every call of the command that reads or changes the tree fails once
// (EIO), and each that changes it is cut on entry: tz_latest then names
// the update it named before or the whole new one, the device's links are
// untouched, no error is new, and the same command run again leaves what
// the command left uninterrupted. A check, failing, changes nothing and
// passes nothing it did not see: adopted, it says what the clean one said.
void
try_update_faults(const std::string& args, const std::string& pristine, const std::string& done,
                  const std::string& judged)
{
    std::string restore = "rm -rf /var/* && cp -a " + pristine + "/. /var";
    run(restore);
    std::string was = links(), latest_was = latest_of(state()), errors_were = errors();
    std::string command = update(args).substr(5); // without its exec
    run("exec strace -f -qq -o " + pristine + ".trace " + command);
    const std::regex changing("mkdirat|write|fchmod|syncfs|fsync|renameat2?|symlinkat|unlinkat");
    const std::regex reading("readlinkat|newfstatat|getdents64|openat|read");
    bool staging = args.compare(0, 5, "stage") == 0, checking = args.compare(0, 5, "check") == 0;
    int injected = 0, cuts = 0;
    for (const auto& [name, when, call] : calls_in(pristine + ".trace")) {
        bool changes =
            std::regex_match(name, changing) || call.find("O_CREAT") != std::string::npos;
        if (!changes && !std::regex_match(name, reading))
            continue;
        for (const char* how : {":error=EIO", ":signal=KILL"}) {
            if (how[1] == 's' && !changes)
                continue;
            run(restore);
            std::string inject = name + how + ":when=" + when;
            outcome o = run("exec strace -f -qq -o /dev/null -e inject=" + inject + " " + command);
            ++(how[1] == 'e' ? injected : cuts);
            if (checking) {
                EXPECT_TRUE(o.status > 1 || o.out == judged) << inject << ": " << o.out;
                EXPECT_EQ(state(), done) << inject;
                continue;
            }
            std::string latest = latest_of(state());
            EXPECT_TRUE(latest == latest_was || latest == latest_of(done))
                << inject << ": " << latest;
            if (staging && latest != latest_was) {
                EXPECT_EQ(run("diff -r /var/tmp/src $(readlink /var/db/timezone/tz_latest)").status,
                          0)
                    << inject << ": a partial copy staged";
            }
            EXPECT_EQ(links(), was) << inject;
            EXPECT_EQ(errors(), errors_were) << inject;
            EXPECT_EQ(run(update(args)).status, 0) << inject << ": again";
            EXPECT_EQ(staging ? latest_of(state()) : state(), staging ? latest_of(done) : done)
                << inject << ": again";
        }
    }
    std::cout << "UPDATE FAULTS injected " << injected << " cuts " << cuts << "\n";
}

class update_tool : public ::testing::TestWithParam<row> {};

TEST_P(update_tool, row)
{
    const row& r = GetParam();
    if (getenv("TZLINKS_FAULTS") != nullptr && !r.faults)
        GTEST_SKIP() << "not a row of the fault mode";
    ASSERT_TRUE(set_up(r)) << r.tree;
    bool checking = r.args.compare(0, 5, "check") == 0,
         staging = r.args.compare(0, 5, "stage") == 0;
    std::string source = std::regex_replace(r.args, std::regex("^stage|--force|--wait [0-9]+"), "");
    std::string judged = checking || staging ? run(update("check " + source + " --json")).out : "";
    bool faults = getenv("TZLINKS_FAULTS") != nullptr && r.faults;
    std::string pristine = faults ? run("d=$(mktemp -d) && cp -a /var/. $d && printf $d").out : "";
    auto before = snapshot();
    outcome o = run(update(r.args));
    std::string done = state();
    std::string got = "exit=" + std::to_string(o.status);
    if (r.expect.find("problems=") != std::string::npos)
        got += " problems=" + joined(ids(json::parse(judged), "problems"));
    if (r.expect.find("latest=") != std::string::npos)
        got += " " + (r.expect.find(" tz=") != std::string::npos ? done : latest_of(done));
    EXPECT_EQ(got, r.expect) << o.out << o.err;
    auto after = snapshot();
    after.erase("/var/db/timezone/.tzlinks-update.lock");
    before.erase("/var/db/timezone/.tzlinks-update.lock");
    if (checking || o.status != 0) {
        EXPECT_EQ(changes(before, after), std::vector<std::string>()) << "it changed the tree";
    }
    if (staging && o.status == 0) {
        std::string latest = run("readlink -n /var/db/timezone/tz_latest").out;
        EXPECT_EQ(run("diff -r /var/tmp/src " + latest).status, 0);
        // Readable by every reader of time-zone data, whatever SRC's modes.
        EXPECT_EQ(run("find " + latest + " ! -type l ! -perm -0444").out, "");
        // The boot then does what check foretold.
        outcome boot = run(tzlinks());
        json now = json::parse(run(program(TZLINKS_STATUS_BINARY, "--json")).out),
             foretold = json::parse(judged)["next_boot"], &said = foretold["messages"];
        EXPECT_EQ(json({now["zoneinfo"], now["icutz"], now["localtime"], boot.err}),
                  json({foretold["zoneinfo"], foretold["icutz"], foretold["localtime"],
                        joined(said, "\n") + (said.empty() ? "" : "\n")}));
    }
    if (faults && (checking || o.status == 0))
        try_update_faults(r.args, pristine, done, o.out);
}

// A real update, made of zone files compiled by zic and of ICU's own data,
// is staged and booted; then real readers of each find it: date through
// /etc/localtime, and ICU through the live icutz.
TEST(update, real_data)
{
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(build_tree("system_dataset 2023c 44l; etc_localtime; live_system; "
                           "real_update_source /var/tmp/src 2025b"));
    EXPECT_EQ(run(update("stage /var/tmp/src")).status, 0);
    EXPECT_EQ(run(tzlinks()).status, 0);
    EXPECT_EQ(run(program(TZLINKS_STATUS_BINARY)).status, 0);
    EXPECT_EQ(run("unset TZ; exec date +%Z").out, "XPT\n");
    EXPECT_NE(run("ICU_TIMEZONE_FILES_DIR=/var/db/timezone/icutz exec icuinfo")
                  .out.find("<param name=\"tz.version\">2025b</param>"),
              std::string::npos);
}

// The command line, and the lock: a second caller waits for the first,
// then gives up naming it, as the kernel tells.
TEST(update, command_line)
{
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(
        build_tree("system_dataset 2023c 44l; live_system; update_source /var/tmp/src 2025b 44l"));
    std::string holder =
        run("cd /var/db/timezone && { python3 -c 'import fcntl, sys, time; "
            "f = open(sys.argv[1], \"a\"); fcntl.lockf(f, fcntl.LOCK_EX); time.sleep(3)' "
            ".tzlinks-update.lock & } && echo $! && sleep 0.3")
            .out;
    const std::pair<std::string, std::string> uses[] = {
        {"", "64 tzlinks-update: missing command: check, stage or prune\n"},
        {"check", "64 tzlinks-update: missing SRC for: check\n"},
        {"prune --dry-run --dry-run", "64 tzlinks-update: given twice: --dry-run\n"},
        {"prune --dry", "64 tzlinks-update: unknown argument: --dry\n"},
        {"check /var/tmp/src --force", "64 tzlinks-update: not an option of check: --force\n"},
        {"check /var/tmp/src extra", "64 tzlinks-update: unknown argument: extra\n"},
        {"--help", "0 usage: tzlinks-update check SRC [--as V] [--json] [--root DIR]\n"},
        {"stage /var/tmp/src --wait 1", "75 tzlinks-update: /var/db/timezone/.tzlinks-update.lock "
                                        "is held by process " +
                                            holder.substr(0, holder.size() - 1) +
                                            ": gave up after 1 s\n"},
    };
    for (const auto& [args, expected] : uses) {
        outcome o = run(update(args));
        std::string said = o.err + o.out;
        EXPECT_EQ(std::to_string(o.status) + " " + said.substr(0, said.find('\n') + 1), expected)
            << args;
    }
    EXPECT_EQ(run(update("stage /var/tmp/src --wait 5")).status, 0) << "once the first let go";
    // Names are shown escaped; what is no directory is left.
    run("mkdir \"/var/db/timezone/tz/x$(printf '\\033[31m\\342\\200\\256\\342\\201\\251\\nz')\"; "
        "touch /var/db/timezone/tz/notes");
    std::string pruned = run(update("prune")).out;
    EXPECT_NE(
        pruned.find("Removed /var/db/timezone/tz/x\\x1b[31m\\xe2\\x80\\xae\\xe2\\x81\\xa9\\x0az\n"),
        std::string::npos)
        << pruned;
    EXPECT_NE(pruned.find("Left /var/db/timezone/tz/notes: it is no directory\n"),
              std::string::npos);
    // A file system mounted inside an update no link names is left as it
    // is, and named; a full one is said to be full.
    run("mkdir -p /var/db/timezone/tz/old/zoneinfo && mount -t tmpfs m "
        "/var/db/timezone/tz/old/zoneinfo && touch /var/db/timezone/tz/old/zoneinfo/kept");
    outcome mounted = run(update("prune"));
    EXPECT_EQ(
        std::to_string(mounted.status) + mounted.err,
        "74tzlinks-update: cannot remove /var/db/timezone/tz/old/zoneinfo: Device or resource "
        "busy\n");
    EXPECT_EQ(run("ls /var/db/timezone/tz/old/zoneinfo").out, "kept\n");
    run("mount -t tmpfs -o size=4k full /var/db/timezone/tz");
    outcome full = run(update("stage /var/tmp/src --as 2025b.2.0"));
    EXPECT_EQ(full.status, 74);
    EXPECT_NE(full.err.find(": No space left on device\n"), std::string::npos) << full.err;
}

// Sources no update resembles, or that a writer changes while they are
// staged: 5,000 levels, refused without a crash; a zone file swapped with a
// link to /etc/shadow a hundred times over while it is staged, never
// staged as that link. What is staged is what was checked.
TEST(update, hostile_sources)
{
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(build_tree("system_dataset 2023c 44l; etc_localtime; live_system; "
                           "update_source /dev/shm/deep 2025b 44l; update_source /dev/shm/race "
                           "2025b 44l"));
    // Made by descriptor: no shell can cd so deep.
    run("cd /dev/shm/deep/zoneinfo && exec python3 -c 'import os\nfd = os.open(\".\", 0)\n"
        "for i in range(5000):\n    os.mkdir(\"d\", dir_fd=fd); fd = os.open(\"d\", 0, "
        "dir_fd=fd)'");
    outcome deep = run(update("stage /dev/shm/deep"));
    EXPECT_EQ(deep.status, 2);
    std::string deepest = std::regex_replace(std::string(16, 'd'), std::regex("d"), "/d");
    EXPECT_NE(deep.out.find("/dev/shm/deep/zoneinfo" + deepest + " lies deeper than 16 levels"),
              std::string::npos)
        << deep.out;
    run("cd /dev/shm/race/zoneinfo/Europe && { while :; do ln -s /etc/shadow P; mv -T P Paris; "
        "cp ../America/Los_Angeles P; mv -T P Paris; done & echo $! >/dev/shm/writer; }");
    int staged = 0;
    for (int round = 0; round < 100; ++round)
        staged +=
            run(update("stage /dev/shm/race --as 2025b.1." + std::to_string(round))).status == 0;
    run("kill $(cat /dev/shm/writer)");
    EXPECT_EQ(run("find /var/db/timezone/tz -type l").out, "") << "a link out of the update staged";
    EXPECT_GT(staged, 0);
    std::cout << "RACE rounds 100 staged " << staged << "\n";
}

// Entries in tz/ by the thousand: the report, check and stage cost time
// linear in them, and the updates no link names are one finding, with one
// command. (Timed only in a plain build.)
TEST(update, many_updates)
{
    if (getenv("TZLINKS_RUNNER") != nullptr || TZLINKS_SANITIZED)
        GTEST_SKIP() << "measured only in a plain build";
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(build_tree("system_dataset 2023c 44l; etc_localtime; live_update 2024a.1.0; "
                           "update_source /dev/shm/src 2025b 44l"));
    for (const char* count : {"1000", "100000"}) {
        run(std::string("cd /var/db/timezone/tz && seq ") + count + " | xargs mkdir -p");
        outcome status = run(program(TZLINKS_STATUS_BINARY, "--json")),
                check = run(update("check /dev/shm/src")),
                stage = run(update("stage /dev/shm/src --as 2025b.1." + std::string(count)));
        json report = json::parse(status.out);
        EXPECT_EQ(ids(report), std::vector<std::string>{"update-unnamed"});
        EXPECT_LT(status.seconds, 2.0) << count;
        EXPECT_LT(check.seconds + stage.seconds, 2.0) << count;
        std::cout << "MANY " << count << " status " << status.seconds << " s, check "
                  << check.seconds << " s, stage " << stage.seconds << " s\n";
    }
}

// An image whose /var/db/timezone is an absolute link, as where /var is
// small: every program follows it inside the image, never to the host's
// path of that name (here the sandbox's /var/lib/timezone, a decoy that
// must stay as it is), and names the image's own paths; the report then
// foretells the boot that check foretold.
TEST(update, image_with_absolute_link)
{
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(build_tree("TREE=/dev/shm/image; system_dataset 2023c 44l; live_system; "
                           "update_dataset 2023d 44l; mkdir -p $TREE/var/lib; mv $TREE$tz "
                           "$TREE/var/lib/timezone; ln -s /var/lib/timezone $TREE$tz; TREE=; "
                           "update_dataset 2023d 44l; mkdir -p /var/lib; mv $tz /var/lib/timezone; "
                           "update_source /var/tmp/src 2025b 44l"));
    std::string decoy = run("find /var/lib/timezone -printf '%p %C@\\n'").out,
                image = " --root /dev/shm/./image", real = "/dev/shm/image/var/lib/timezone";
    json judged = json::parse(run(update("check /var/tmp/src --json" + image)).out);
    EXPECT_EQ(judged["verdict"], 0);
    outcome staged = run(update("stage /var/tmp/src" + image));
    EXPECT_EQ(staged.out.substr(0, staged.out.find('\n')),
              "Staged " + real + "/tz/2025b.1.0 as 2025b.1.0");
    EXPECT_EQ(json::parse(run(program(TZLINKS_STATUS_BINARY, "--json" + image)).out)["next_boot"],
              judged["next_boot"]);
    EXPECT_EQ(run(update("prune" + image)).out, "Removed " + real + "/tz/2023d\n");
    // A repair links to the device's own path, in the image's real place.
    run("ln -sfn tz/2025b.1.0 " + real + "/tz_latest");
    EXPECT_EQ(run(program(TZLINKS_STATUS_BINARY, "--commands" + image)).out,
              "ln -sfn /var/db/timezone/tz/2025b.1.0 " + real + "/tz_latest\n");
    EXPECT_EQ(run("ls -A " + real + "/tz " + real + "/.tzlinks-update.lock").status, 0);
    EXPECT_EQ(run("find /var/lib/timezone -printf '%p %C@\\n'").out, decoy);
}

INSTANTIATE_TEST_SUITE_P(tzlinks_update, update_tool, ::testing::ValuesIn(load_rows("update.rows")),
                         [](const auto& each) { return each.param.name; });

} // namespace
