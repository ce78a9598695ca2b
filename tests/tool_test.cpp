// SPDX-License-Identifier: Apache-2.0
// Runs the rows of tests/tool.rows: the real tzlinks binary on a sample
// device tree in the sandbox, with its exact standard error, exit status
// and every entry it changes. Before it, tzlinks-status reads the same
// tree, from inside and through --root on a copy: both reports must be the
// same, change nothing, and foretell under next_boot what tzlinks then
// does, as a report of the tree afterwards shows it.
#include "harness.h"

#include <csignal>
#include <fstream>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <regex>
#include <set>
#include <sys/wait.h>
#include <unistd.h>

namespace {

using nlohmann::json;

// A report of tzlinks-status --json, read as JSON.
json
status_report(const std::string& args = "")
{
    return json::parse(run(program(TZLINKS_STATUS_BINARY, "--json " + args)).out);
}

class tool : public ::testing::TestWithParam<row> {};

TEST_P(tool, row)
{
    const row& r = GetParam();
    if (getenv("TZLINKS_FAULTS") != nullptr && !r.faults)
        GTEST_SKIP() << "not a row of the fault mode";
    ASSERT_TRUE(set_up(r)) << r.tree;
    auto before = snapshot(true), plain_before = snapshot();
    std::string text = run(program(TZLINKS_STATUS_BINARY, "--json")).out;
    json report = json::parse(text);
    EXPECT_EQ(snapshot(true), before) << "tzlinks-status changed the tree";
    std::string found = joined(ids(report));
    EXPECT_EQ(report["next_boot"]["action"].get<std::string>() + ":" +
                  report["health"].get<std::string>() + (found.empty() ? "" : ":" + found),
              r.health);
    std::string copy = run("d=$(mktemp -d) && cd / && { cp -a --parents var usr/share "
                           "etc/localtime $d; printf $d; }")
                           .out;
    ASSERT_FALSE(copy.empty());
    outcome through_root = run(program(TZLINKS_STATUS_BINARY, "--json --root " + copy));
    // Its commands name the copy's paths; nothing else may differ.
    through_root.out = std::regex_replace(through_root.out, std::regex("( --root )?" + copy), "");
    if (!r.local) {
        EXPECT_EQ(through_root.out, text) << "the report differs through --root";
        EXPECT_EQ(through_root.status, report["health"] == "healthy"    ? 0
                                       : report["health"] == "degraded" ? 1
                                                                        : 2);
    }

    outcome run_ = run(tzlinks(r.inject));
    EXPECT_EQ(run_.out + run_.err, r.err); // nothing on standard output
    EXPECT_EQ(run_.status, r.exit);
    EXPECT_EQ(changes(plain_before, snapshot()), r.changes);
    const std::string record = "/var/db/timezone/TZVersionDiffRecord";
    bool written = snapshot(true)[record] != before[record];
    json after = status_report();
    if (r.inject.empty()) { // what strace does, nothing can foresee
        json foretold = report["next_boot"];
        foretold.erase("action");
        json& messages = foretold["messages"];
        messages = joined(messages, "\n") + (messages.empty() ? "" : "\n");
        EXPECT_EQ(foretold, json({{"zoneinfo", after["zoneinfo"]},
                                  {"icutz", after["icutz"]},
                                  {"localtime", after["localtime"]},
                                  {"record", written ? after["record"] : json()},
                                  {"exit_status", run_.status},
                                  {"messages", run_.err}}));
    }
    if (getenv("TZLINKS_FAULTS") != nullptr && r.faults)
        try_faults(copy + "/var");

    // The repairs, on the tree as it was: every finding's commands, then one
    // boot. The report then is the one foretold, and its only errors are
    // those that need a person; no command shown failed its own check.
    for (const json& finding : report["findings"])
        EXPECT_FALSE(finding["commands"].is_array() && !finding["verified"])
            << "a repair that the simulation does not show to work: " << finding;
    EXPECT_EQ(schema_breaks({text, through_root.out, after.dump()}), "");
    if (r.local)
        return (void)run("rm -rf " + copy);
    run("rm -rf /var/* /usr/share/* /etc/localtime && cd " + copy +
        " && cp -a var/. /var && cp -a usr/share/. /usr/share && cp -a etc/. /etc");
    std::ofstream(copy + ".sh") << run(program(TZLINKS_STATUS_BINARY, "--commands")).out;
    EXPECT_EQ(run(update_on_path() + "exec sh -e " + copy + ".sh").status, 0);
    run(tzlinks());
    json repaired = status_report();
    EXPECT_EQ(json({{"health", repaired["health"]}, {"findings", ids(repaired)}}),
              report["after_repair"]);
    for (const json& finding : repaired["findings"])
        EXPECT_FALSE(finding["severity"] == "error" && finding["commands"].is_array())
            << "the repairs leave an error with commands: " << finding;
    EXPECT_EQ(schema_breaks({repaired.dump()}), "");
    run("rm -rf " + copy + " " + copy + ".sh");
}

INSTANTIATE_TEST_SUITE_P(tzlinks, tool, ::testing::ValuesIn(load_rows("tool.rows")),
                         [](const auto& each) { return each.param.name; });

// UTF-8 of one to four bytes, the first and last of each length, after a
// space: the same in text and JSON. Then bytes that are not, between
// slashes: overlong forms, surrogates, beyond U+10FFFF, lead bytes without
// their continuation, a continuation alone, and last a sequence cut short.
const std::string utf8 = "/ /\xc3\xa9/\xc2\x80/\xdf\xbf/\xe0\xa0\x80/\xed\x9f\xbf/\xef\xbf\xbf/"
                         "\xf0\x90\x80\x80/\xf4\x8f\xbf\xbf";
const std::string not_utf8 =
    "/\xc1\xbf/\xe0\x9f\xbf/\xed\xa0\x80/\xf0\x8f\xbf\xbf/\xf4\x90\x80\x80/"
    "\xf5\x80\x80\x80/\xc3/\xe2\x82/\x80/\xf0\x9f\x98";

// tzlinks-status's command line; and the bytes of a name that are not
// UTF-8, or are control characters, as \udcHH and \u00HH in JSON and as
// \xHH in text, a quote and a backslash escaped in JSON only.
TEST(status, command_line)
{
    const std::string usage =
        "usage: tzlinks-status [--json | --commands | --metrics[=DIR]] [--root DIR]\n"
        "       tzlinks-status --help | --version\n";
    const std::tuple<std::string, int, std::string, std::string> uses[] = {
        {"--help", 0, usage + "Reports which time-zone data a device uses", ""},
        {"--json --commands", 64, "",
         "tzlinks-status: given with another form: --commands\n" + usage},
        {"--root=/ --root /", 64, "", "tzlinks-status: given twice: --root\n" + usage},
        {"--root /proc/self", 66, "",
         "tzlinks-status: /proc/self holds no device tree: it lacks var/ or usr/share/\n"},
        {"--version", 0, "tzlinks-status " TZLINKS_VERSION "\n", ""},
        {"-x", 64, "", "tzlinks-status: unknown argument: -x\n" + usage},
        {"--metricsfoo", 64, "", "tzlinks-status: unknown argument: --metricsfoo\n" + usage},
        {"--js", 64, "", "tzlinks-status: unknown argument: --js\n" + usage},
        {"--metrics=", 64, "", "tzlinks-status: missing value after: --metrics=\n" + usage},
        {"--json --root", 64, "", "tzlinks-status: missing directory after: --root\n" + usage},
        {"--root=/no", 66, "", "tzlinks-status: cannot read /no: No such file or directory\n"},
        {"--root /dev/null", 66, "", "tzlinks-status: cannot read /dev/null: Not a directory\n"},
    };
    for (const auto& [args, status, out, err] : uses) {
        outcome o = run(program(TZLINKS_STATUS_BINARY, args));
        EXPECT_EQ(std::to_string(o.status) + o.out.substr(0, out.size()) + o.err,
                  std::to_string(status) + out + err);
        EXPECT_EQ(o.out.empty(), out.empty());
    }
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(build_tree("system_dataset 2023c 44l; live_system"));
    // C1 controls (U+0080 to U+009F, a terminal's CSI among them) and the
    // right-to-left override U+202E are escaped in text as C0 ones are;
    // U+00A0 is not.
    std::string c1 = "\xc2\x9b/\xe2\x80\xae/\xc2\xa0";
    std::string target = "/x/\x01\x7f\"\\" + c1 + utf8,
                text = "/x/\\x01\\x7f\"\\\\xc2\\x9b/\\xe2\\x80\\xae/\xc2\xa0" +
                       std::regex_replace(utf8, std::regex("\xc2\x80"), "\\xc2\\x80"),
                in_json = "/x/\\u0001\x7f\\\"\\\\" + c1 + utf8;
    for (char c : not_utf8) {
        std::string hex = {"0123456789abcdef"[(c >> 4) & 15], "0123456789abcdef"[c & 15]};
        target += c, text += c == '/' ? "/" : "\\x" + hex,
            in_json += c == '/' ? "/" : "\\udc" + hex;
    }
    ASSERT_EQ(symlink(target.c_str(), "/var/db/timezone/tz_latest"), 0);
    EXPECT_NE(run(program(TZLINKS_STATUS_BINARY))
                  .out.find("  tz_latest -> " + text + "\n  The zone is Europe/Paris.\n" +
                            "  There is no record of an adoption.\nNext boot\n" +
                            "  It keeps the data in use.\n"),
              std::string::npos);
    std::string system = "\"root\":null,\"version\":\"2023c.1.0\",\"version_understood\":true,"
                         "\"icu_schema\":\"44l\",\"unreadable\":false";
    EXPECT_NE(run(program(TZLINKS_STATUS_BINARY, "--json"))
                  .out.find("\"tz_latest\":\"" + in_json +
                            "\",\"record\":null,\"localtime_zone\":\"Europe/Paris\",\"live\":{" +
                            system + ",\"compatible\":true,\"older\":false},\"system\":{" + system +
                            "},\"latest\":null,"),
              std::string::npos);
    // Nothing any command can repair: an empty script says so.
    ASSERT_TRUE(build_tree("rm $tz/tz_latest; mv /usr/share/zoneinfo.default /usr/share/z"));
    outcome needs = run(program(TZLINKS_STATUS_BINARY, "--commands"));
    EXPECT_EQ(std::to_string(needs.status) + needs.out + needs.err,
              "0tzlinks-status: no command to run: 3 findings need what only a person can supply "
              "(see \"Needs:\" in the report)\n");
    ASSERT_TRUE(build_tree("mv /usr/share/z /usr/share/zoneinfo.default"));
    outcome full = run(program(TZLINKS_STATUS_BINARY, ">/dev/full"));
    EXPECT_EQ(std::to_string(full.status) + full.err,
              "74tzlinks-status: cannot write the report: No space left on device\n");
}

// What cannot be read is said to be so, never taken for an absence: the
// system's ICU data unreadable to the boot's user marks the system data
// (and no other) unreadable; another user than root is told it may read
// less than the boot; every listing failing (EIO) leaves a finding for
// each directory the boot lists, never an empty one.
TEST(status, unreadable)
{
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(build_tree("system_dataset 2023c 44l; live_system; update_dataset 2024a 44l; "
                           "latest 2024a; chmod 000 /usr/share/icu"));
    drop_capabilities("-dac_override,-dac_read_search");
    json report = status_report();
    drop_capabilities("");
    EXPECT_EQ(json({report["system"]["unreadable"], report["latest"]["unreadable"]}),
              json({true, false}));
    // As another user than the boot's, it says what it could not ask.
    std::string other = run("exec unshare -U --map-user=1000 --map-group=1000 sh -c '" +
                            program(TZLINKS_STATUS_BINARY) + "'")
                            .out;
    EXPECT_NE(other.find("note unverified: tzlinks-status runs as user 1000, not as root"),
              std::string::npos);
    EXPECT_NE(other.find("note unreadable: /usr/share/icu cannot be read: Permission denied "
                         "(by this user; the boot, as root, may read it)"),
              std::string::npos);
    std::string failing = run("exec strace -f -qq -o /dev/null -e inject=getdents64:error=EIO " +
                              program(TZLINKS_STATUS_BINARY).substr(5))
                              .out;
    EXPECT_NE(failing.find("warning unreadable: /var/db/timezone/tz/2024a/icutz cannot be read: "
                           "Input/output error"),
              std::string::npos)
        << failing;
}

// Whatever a tree holds, tzlinks keeps no update's +VERSION, and
// tzlinks-status reads no file whole, finishes in a second and writes every
// text longer than 8 KiB cut. (Not under an emulator, valgrind or a
// sanitizer, which change what is measured.)
TEST(status, bounded)
{
    if (getenv("TZLINKS_RUNNER") != nullptr || TZLINKS_SANITIZED)
        GTEST_SKIP() << "measured only in a plain build";
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(build_tree("system_dataset 2023c 44l; live_update 2024a; latest 2024a"));
    long small = run(tzlinks()).max_rss;
    ASSERT_TRUE(build_tree("repeat 67108864 a >$tz/tz/2024a/zoneinfo/+VERSION"));
    EXPECT_LT(run(tzlinks()).max_rss - small, 1024) << "KiB more for a 64 MiB +VERSION";
    ASSERT_TRUE(build_tree("repeat 67108864 x >/usr/share/zoneinfo.default/+VERSION; "
                           "repeat 67108864 b >$tz/TZVersionDiffRecord"));
    for (const char* form : {"", "--json"}) {
        outcome o = run(program(TZLINKS_STATUS_BINARY, form));
        EXPECT_LT(o.max_rss, 16384) << form;
        EXPECT_LT(o.seconds, 1.0) << form;
        EXPECT_LT(o.out.size(), 256U * 1024) << form;
        EXPECT_NE(o.out.find("[cut]"), std::string::npos) << form;
    }
}

// One HTTP request for the metrics that node_exporter serves on port.
std::string
scrape(int port)
{
    return run("exec /usr/bin/python3 -c 'import sys, urllib.request; sys.stdout.write(urllib."
               "request.urlopen(sys.argv[1]).read().decode())' http://127.0.0.1:" +
               std::to_string(port) + "/metrics 2>/dev/null")
        .out;
}

// Debian's node_exporter, its textfile collector pointed at what
// --metrics=DIR wrote, serves the report: a healthy device, then the same
// one degraded.
TEST(status, metrics_served)
{
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(build_tree("system_dataset 2023c 44l; etc_localtime; live_update 2024a.1.0; "
                           "latest 2024a.1.0; mkdir /dev/shm/textfile"));
    int port = 20000 + getpid() % 20000;
    pid_t exporter = fork();
    if (exporter == 0) {
        execl("/usr/bin/prometheus-node-exporter", "prometheus-node-exporter",
              ("--web.listen-address=127.0.0.1:" + std::to_string(port)).c_str(),
              "--collector.disable-defaults", "--collector.textfile",
              "--collector.textfile.directory=/dev/shm/textfile", "--log.level=error", nullptr);
        _exit(127);
    }
    const std::pair<const char*, const char*> cases[] = {
        {"", "tzlinks_health 0\n"}, {"rm /etc/localtime", "tzlinks_health 1\n"}};
    for (const auto& [change, health] : cases) {
        ASSERT_TRUE(build_tree(change));
        EXPECT_EQ(run(program(TZLINKS_STATUS_BINARY, "--metrics=/dev/shm/textfile")).status, 0);
        EXPECT_EQ(run("stat -c %a /dev/shm/textfile/tzlinks.prom").out, "644\n");
        EXPECT_NE(run(program(TZLINKS_STATUS_BINARY, "--metrics")).out.find(health),
                  std::string::npos);
        outcome lint = run("exec promtool check metrics </dev/shm/textfile/tzlinks.prom");
        EXPECT_EQ(std::to_string(lint.status) + lint.out + lint.err, "0");
        std::string served;
        for (int tries = 0; tries < 50 && served.empty(); ++tries, usleep(100000))
            served = scrape(port);
        EXPECT_NE(served.find(health), std::string::npos) << served;
        EXPECT_NE(served.find("tzlinks_dataset_info{icu_schema=\"44l\",role=\"live\","
                              "version=\"2024a.1.0\"} 1\n"),
                  std::string::npos);
        EXPECT_NE(served.find("tzlinks_next_boot_info{action=\"keep\"} 1\n"), std::string::npos);
    }
    kill(exporter, SIGTERM);
    waitpid(exporter, nullptr, 0);
}

// The README's example of a report is the report of the demo's device.
TEST(status, readme_example)
{
    ASSERT_TRUE(fresh_tree());
    ASSERT_TRUE(build_tree("demo_device"));
    EXPECT_EQ(
        run(program(TZLINKS_STATUS_BINARY)).out,
        run("sed -n '/^    \\$ tzlinks-status --root/,/^    Health/ s/^    //p' " TZLINKS_SOURCE_DIR
            "/README.md | sed 1d")
            .out);
}

} // namespace

namespace {

// Device states, each a handful of ways, combined every way. Updates
// 2024a.1.0 (good) and 2025a.1.0 (newer, broken as the third state says)
// beside the system data 2023c; the zone is Europe/Paris.
const std::vector<std::vector<std::string>> states = {
    // zoneinfo: the system's, each update's, missing, dangling, relative
    {"ln -s /usr/share/zoneinfo.default $tz/zoneinfo",
     "ln -s $tz/tz/2024a.1.0/zoneinfo $tz/zoneinfo; ln -s $tz/tz/2024a.1.0/icutz $tz/icutz",
     "ln -s $tz/tz/2025a.1.0/zoneinfo $tz/zoneinfo; ln -s $tz/tz/2025a.1.0/icutz $tz/icutz", ":",
     "ln -s $tz/tz/gone/zoneinfo $tz/zoneinfo", "ln -s tz/2024a.1.0/zoneinfo $tz/zoneinfo"},
    // tz_latest: none, each update, one gone, other spellings
    {":", "latest 2024a.1.0", "latest 2025a.1.0", "latest gone", "ln -s tz/2025a.1.0 $tz/tz_latest",
     "ln -s /var/db/timezone//tz/2025a.1.0 $tz/tz_latest"},
    // the newer update: good, without the zone, without ICU data, with
    // another schema's, without its tz database
    {":", "rm $tz/tz/2025a.1.0/zoneinfo/Europe/Paris", "rm $tz/tz/2025a.1.0/icutz/icutz44l.dat",
     "mv $tz/tz/2025a.1.0/icutz/icutz44l.dat $tz/tz/2025a.1.0/icutz/icutz46l.dat",
     "rm -r $tz/tz/2025a.1.0/zoneinfo"},
    // localtime: in the live tree, the legacy one, missing, a trailing slash
    {"ln -s $tz/zoneinfo/Europe/Paris $tz/localtime",
     "ln -s /usr/share/zoneinfo/Europe/Paris $tz/localtime", ":",
     "ln -s $tz/zoneinfo/Europe/Paris/ $tz/localtime"},
    // /etc/localtime: through localtime, as systemd writes it, missing
    {":", "ln -sfn ../usr/share/zoneinfo.default/Europe/Paris /etc/localtime", "rm /etc/localtime"},
    // the legacy ICU link
    {":", "ln -s $tz/tz/2024a.1.0/icutz /var/db/icutz"},
};

// Devices broken the way the field breaks them: the commands each report
// shows, and after them and one boot, the data in use and the zone. The
// zone is Europe/Paris; 2024a.1.0 is good, 2025a.1.0 is newer.
const std::string back = "ln -sfn $tz/tz/2024a.1.0 $tz/tz_latest; ",
                  roll = back + "rm -f $tz/zoneinfo; rm -f $tz/icutz; tzlinks-update prune; ",
                  at_2024a = "$tz/tz/2024a.1.0/zoneinfo Europe/Paris",
                  old = "update_dataset 2024a.1.0 44l; ",
                  berlin_unset = "live_system; relink localtime $tz/zoneinfo/America/Los_Angeles; ",
                  system = "/usr/share/zoneinfo.default Europe/Paris",
                  debian = "put_file /usr/share/zoneinfo.default/tzdata.zi '# version 2024b\\n'";
const std::tuple<std::string, std::string, std::string> field_cases[] = {
    // Adopted, then found to lack its ICU data or its tz database: back to
    // the update it replaced.
    {old + "live_update 2025a.1.0; latest 2025a.1.0; rm $tz/tz/2025a.1.0/icutz/icutz44l.dat", roll,
     at_2024a},
    {old + "live_update 2025a.1.0; latest 2025a.1.0; rm -r $tz/tz/2025a.1.0/zoneinfo", roll,
     at_2024a},
    // Half copied (the zone missing), before and after its boot.
    {"live_update 2024a.1.0; update_dataset 2025a.1.0 44l; latest 2025a.1.0; rm "
     "$tz/tz/2025a.1.0/zoneinfo/Europe/Paris",
     back + "tzlinks-update prune; ", at_2024a},
    {old + "live_update 2025a.1.0; latest 2025a.1.0; rm $tz/tz/2025a.1.0/zoneinfo/Europe/Paris",
     roll, at_2024a},
    {"live_update 2024a.1.0; update_dataset 2025a.1.0 44l; latest 2025a.1.0; rm -r "
     "$tz/tz/2025a.1.0/zoneinfo",
     back + "tzlinks-update prune; ", at_2024a},
    // Another ICU schema, or none: tz_latest back at the data in use.
    {"live_update 2024a.1.0; update_dataset 2025a.1.0 46l; latest 2025a.1.0",
     back + "tzlinks-update prune; ", at_2024a},
    {"live_update 2024a.1.0; update_dataset 2025a.1.0 44l; latest 2025a.1.0; rm "
     "$tz/tz/2025a.1.0/icutz/icutz44l.dat",
     back + "tzlinks-update prune; ", at_2024a},
    // Named for its package: renamed and adopted in one round.
    {"live_update 2024a.1.0; update_dataset tzdata-2025c 44l; put_file "
     "$tz/tz/tzdata-2025c/zoneinfo/+VERSION 2025c; latest tzdata-2025c",
     "test -e $tz/tz/2025c.1.0 || mv $tz/tz/tzdata-2025c $tz/tz/2025c.1.0; ln -sfn "
     "$tz/tz/2025c.1.0 $tz/tz_latest; ",
     "$tz/tz/2025c.1.0/zoneinfo Europe/Paris"},
    // The zone set through /etc/localtime, absolute or as systemd writes it.
    {berlin_unset + "ln -sfn /usr/share/zoneinfo/Europe/Paris /etc/localtime",
     "ln -sfn $tz/zoneinfo/Europe/Paris $tz/localtime; ln -sfn $tz/localtime /etc/localtime; ",
     system},
    {berlin_unset + "ln -sfn ../usr/share/zoneinfo/Europe/Paris /etc/localtime",
     "ln -sfn $tz/zoneinfo/Europe/Paris $tz/localtime; ln -sfn $tz/localtime /etc/localtime; ",
     system},
    // icutz that loops; tz_latest spelled otherwise; a zone with a slash.
    {"live_update 2024a.1.0; relink icutz $tz/icutz", "ln -sfn $tz/tz/2024a.1.0/icutz $tz/icutz; ",
     at_2024a},
    {old + "live_system; relink tz_latest $tz/tz/./2024a.1.0", back, at_2024a},
    {"live_system; relink localtime $tz/zoneinfo/Europe/Paris/",
     "ln -sfn $tz/zoneinfo/Europe/Paris $tz/localtime; ", system},
    // Laid out the Debian way: the release only in tzdata.zi; a vendor's
    // +VERSION; a restore that made directories of a link and the record.
    {"live_system; mv /usr/share/zoneinfo.default /usr/share/zoneinfo; rm "
     "/usr/share/zoneinfo/+VERSION; put_file /usr/share/zoneinfo/tzdata.zi '# version 2024b\\n'",
     "test -e /usr/share/zoneinfo.default || cp -a /usr/share/zoneinfo "
     "/usr/share/zoneinfo.default; printf '%s\\n' 2024b >/usr/share/zoneinfo.default/+VERSION; ",
     system},
    {"live_system; put_file /usr/share/zoneinfo.default/+VERSION tzdata-2024b; " + debian,
     "printf '%s\\n' 2024b >/usr/share/zoneinfo.default/+VERSION; ", system},
    {"live_system; rm $tz/zoneinfo; mkdir -p $tz/zoneinfo/Europe $tz/TZVersionDiffRecord",
     "rm -rf $tz/zoneinfo; rm -rf $tz/TZVersionDiffRecord; ", system},
};

TEST(status, field_cases)
{
    ASSERT_TRUE(fresh_tree());
    for (const auto& [tree, commands, after] : field_cases) {
        run("rm -rf /var/* /usr/share/*");
        ASSERT_TRUE(build_tree("system_dataset 2023c 44l; etc_localtime; " + tree));
        outcome shown = run(program(TZLINKS_STATUS_BINARY, "--commands"));
        std::string expected = run("tz=/var/db/timezone; printf '%s' \"" + commands + "\"").out;
        EXPECT_EQ(std::regex_replace(shown.out, std::regex("\n"), "; "), expected) << tree;
        run(update_on_path() + "sh -e <<'EOF' && " + tzlinks().substr(5) + "\n" + shown.out +
            "EOF");
        json repaired = status_report();
        EXPECT_EQ(
            joined({repaired["zoneinfo"], repaired["localtime_zone"], repaired["health"]}, " "),
            run("tz=/var/db/timezone; printf '%s' \"" + after + " healthy\"").out)
            << tree;
    }
}

class compose : public ::testing::TestWithParam<int> {};

// The commands of every report, run in order and followed by one boot,
// leave the device as after_repair foretold: none of the findings they
// were to clear comes back, and no error or warning is left that a command
// could clear. (A note the boot's own adoption brings, the update it
// replaced now unnamed, waits for the next prune.) With TZLINKS_TREES=all
// every tree, else every 60th.
TEST_P(compose, trees)
{
    if (getenv("TZLINKS_FAULTS") != nullptr)
        GTEST_SKIP() << "not a row of the fault mode";
    size_t count = 1, every = getenv("TZLINKS_TREES") != nullptr ? 1 : 60, shards = 8;
    for (const auto& ways : states)
        count *= ways.size();
    ASSERT_TRUE(fresh_tree());
    for (size_t tree = static_cast<size_t>(GetParam()) * every; tree < count;
         tree += shards * every) {
        std::string commands = "system_dataset 2023c 44l; etc_localtime; update_dataset 2024a.1.0 "
                               "44l; update_dataset 2025a.1.0 44l";
        for (size_t i = tree, s = 0; s < states.size(); i /= states[s].size(), ++s)
            commands += "; " + states[s][i % states[s].size()];
        run("rm -rf /var/* /usr/share/*");
        ASSERT_TRUE(build_tree(commands)) << commands;
        json report = status_report(), repaired;
        std::string script;
        std::set<std::string> to_clear;
        for (const json& finding : report["findings"]) {
            EXPECT_FALSE(finding["commands"].is_array() && !finding["verified"]) << commands;
            for (const json& command : finding["verified"] ? finding["commands"] : json())
                script += command.get<std::string>() + "\n";
            // A note is told apart by what it says (which updates).
            if (finding["verified"] && !finding["commands"].empty())
                to_clear.insert(finding["id"].get<std::string>() +
                                (finding["severity"] == "note" ? finding["message"] : json(""))
                                    .get<std::string>());
        }
        outcome repair = run(update_on_path() + "sh -e <<'EOF' && " + tzlinks().substr(5) + "\n" +
                             script + "EOF");
        repaired = status_report();
        // Back, though the commands were to clear it; or still to repair.
        std::vector<std::string> left;
        for (const json& finding : repaired["findings"]) {
            std::string said = finding["severity"] == "note" ? finding["message"] : "";
            if (to_clear.count(finding["id"].get<std::string>() + said) != 0 ||
                (finding["severity"] != "note" && finding["commands"].is_array() &&
                 !finding["commands"].empty()))
                left.push_back(finding["id"]);
        }
        EXPECT_EQ(json({repair.status,
                        {{"health", repaired["health"]}, {"findings", ids(repaired)}},
                        left}),
                  json({0, report["after_repair"], std::vector<std::string>()}))
            << commands << "\n"
            << script;
    }
}

INSTANTIATE_TEST_SUITE_P(tzlinks, compose, ::testing::Range(0, 8));

} // namespace
