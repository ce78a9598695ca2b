// The real tzlinks binary on sample device trees: the links, the record,
// every line on standard error and the exit status, one row per scenario.
#include "outcome.h"
#include "run_tool.h"
#include "sandbox.h"

#include <cerrno>

namespace {

struct scenario {
    std::string name;
    std::string tree; // sample-tree commands
    std::string zoneinfo, icutz, localtime, record;
    std::vector<warned> messages;
    int status = 0;
    std::string path = ""; // one more entry to check, if any
    std::string after = "";
};

void
PrintTo(const scenario& row, std::ostream* os)
{
    *os << row.name;
}

class tool : public sandbox_test, public ::testing::WithParamInterface<scenario> {};

TEST_P(tool, run)
{
    const scenario& row = GetParam();
    build_tree(row.tree);
    tool_run run = run_tzlinks();
    std::string expected;
    for (const warned& w : row.messages)
        expected += warning(w.message, w.errnum, "tzlinks");
    EXPECT_EQ(run.err, expected);
    EXPECT_EQ(run.status, row.status);
    EXPECT_EQ(run.out, "");
    EXPECT_EQ(describe("/var/db/timezone/zoneinfo"), row.zoneinfo);
    EXPECT_EQ(describe("/var/db/timezone/icutz"), row.icutz);
    EXPECT_EQ(describe("/var/db/timezone/localtime"), row.localtime);
    EXPECT_EQ(describe("/var/db/timezone/TZVersionDiffRecord"), row.record);
    if (!row.path.empty()) {
        EXPECT_EQ(describe(row.path), row.after) << row.path;
    }
}

// Tree pieces.
const std::string sys = "system_dataset 2023c 44l; ";
const std::string paris = "put_link /var/db/timezone/zoneinfo/Europe/Paris "
                          "/var/db/timezone/localtime; ";

std::string
update(const std::string& name, const std::string& schema = "44l")
{
    return "update_dataset " + name + " " + schema + "; ";
}

std::string
link(const std::string& name, const std::string& target)
{
    return "put_link '" + target + "' /var/db/timezone/" + name + "; ";
}

// Starting points: the system dataset live, or the update 2024a.1.0 live.
const std::string on_system = sys + link("zoneinfo", "/usr/share/zoneinfo.default") + paris;
const std::string tz = "/var/db/timezone/tz/";
const std::string a = tz + "2024a.1.0";
const std::string on_a = sys + update("2024a.1.0") + link("zoneinfo", a + "/zoneinfo") +
                         link("icutz", a + "/icutz") + paris;

std::string
legacy_icu(const std::string& target)
{
    return "put_link '" + target + "' /var/db/icutz; ";
}

// Expected entries.
const std::string none = "absent";
const std::string sys_zi = "-> /usr/share/zoneinfo.default";
const std::string a_zi = "-> " + a + "/zoneinfo";
const std::string a_icu = "-> " + a + "/icutz";
const std::string lt_paris = "-> /var/db/timezone/zoneinfo/Europe/Paris";
const std::string lt_default = "-> /var/db/timezone/zoneinfo/America/Los_Angeles";
const std::string adopted_a = "file:2023c.1.0_2024a.1.0";

const warned invalid = {"Invalid current symlinks; resetting to system partition", ENOENT};
const std::string unable = "Unable to locate data; resetting to system partition";
const warned incompatible = {"Symlink points at data incompatible with installed system", ENOENT};
const warned reset_lt = {"localtime link invalid; resetting to America/Los_Angeles", ENOENT};

warned
refused(const std::string& latest, const std::string& current, int errnum = ENOENT)
{
    return {"New update not compatible or older version: " + latest + " vs. " + current, errnum};
}

const warned last_resort = {"Last resort force_system_dataset() failed", ENOENT};
const warned force_fails = {
    "create_symlink: from /var/db/timezone/zoneinfo to /usr/share/zoneinfo.default", ENOENT};

// clang-format off
const scenario decision_rows[] = {
    {"valid_no_latest", on_a, a_zi, a_icu, lt_paris, none, {}},
    {"adopt_newer", on_system + update("2024a.1.0") + link("tz_latest", a),
     a_zi, a_icu, lt_paris, adopted_a, {}},
    {"adopt_overwrites_record", on_system + update("2024a.1.0") + link("tz_latest", a) +
         "put_file /var/db/timezone/TZVersionDiffRecord 'an older and longer record'",
     a_zi, a_icu, lt_paris, adopted_a, {}},
    {"latest_is_current", on_a + link("tz_latest", a),
     a_zi, a_icu, lt_paris, none, {refused("2024a.1.0", "2024a.1.0")}},
    {"latest_incompatible", on_system + update("2024b", "46l") + link("tz_latest", tz + "2024b"),
     sys_zi, none, lt_paris, none, {refused("2024b", "2023c.1.0")}},
    {"latest_older", on_a + update("2023d") + link("tz_latest", tz + "2023d"),
     a_zi, a_icu, lt_paris, none, {refused("2023d", "2024a.1.0")}},
    // The walk of the missing ICU directory leaves errno at 0.
    {"latest_removed", on_system + link("tz_latest", tz + "2025a"),
     sys_zi, none, lt_paris, none,
     {{"No ICU schema found for " + tz + "2025a", 0}, refused("2025a", "2023c.1.0", 0)}},
    {"zoneinfo_missing", sys + paris,
     sys_zi, none, lt_paris, none, {{"Bad zoneinfo link ", ENOENT}, invalid}},
    {"zoneinfo_missing_then_adopt", sys + paris + update("2024a.1.0") + link("tz_latest", a),
     a_zi, a_icu, lt_paris, adopted_a, {{"Bad zoneinfo link ", ENOENT}, invalid}},
    {"zoneinfo_unreadable", sys + paris + "put_file /var/db/timezone/zoneinfo x",
     sys_zi, none, lt_paris, none,
     {{"read_symlink: /var/db/timezone/zoneinfo", EINVAL}, {invalid.message, EINVAL}}},
    {"zoneinfo_unrecognised", sys + paris + link("zoneinfo", "/usr/share/zoneinfo"),
     sys_zi, none, lt_paris, none, {{"Bad zoneinfo link /usr/share/zoneinfo", ENOENT}, invalid}},
    {"current_incompatible", sys + paris + update("2024b", "46l") +
         link("zoneinfo", tz + "2024b/zoneinfo") + link("icutz", tz + "2024b/icutz"),
     sys_zi, none, lt_paris, none, {incompatible}},
    // Rejected as older than the system data, the current dataset is still
    // what an update has to beat.
    {"current_older_then_adopt_older", sys + paris + update("2022a") + update("2022b") +
         link("zoneinfo", tz + "2022a/zoneinfo") + link("tz_latest", tz + "2022b"),
     "-> " + tz + "2022b/zoneinfo", "-> " + tz + "2022b/icutz", lt_paris, "file:2023c.1.0_2022b",
     {incompatible}},
    {"current_older_refusal_names_it", sys + paris + update("2022a") + update("2021a") +
         link("zoneinfo", tz + "2022a/zoneinfo") + link("tz_latest", tz + "2021a"),
     sys_zi, none, lt_paris, none, {incompatible, refused("2021a", "2022a")}},
    {"latest_relative", on_a + link("tz_latest", "tz/2024a.1.0"),
     sys_zi, none, lt_paris, none,
     {{"velm_dataset::create_components: bad path tz/2024a.1.0", ENOENT}, {unable, ENOENT}}},
    {"latest_foreign", on_a + link("tz_latest", "/data/tz/2024a.1.0"),
     sys_zi, none, lt_paris, none,
     {{"velm_dataset::create_components: bad path /data/tz/2024a.1.0", ENOENT}, {unable, ENOENT}}},
    {"latest_not_a_link", on_a + "put_file /var/db/timezone/tz_latest x",
     sys_zi, none, lt_paris, none,
     {{"read_symlink: /var/db/timezone/tz_latest", EINVAL}, {unable, EINVAL}}},
    {"record_unwritable", on_system + update("2024a.1.0") + link("tz_latest", a) +
         "mkdir /var/db/timezone/TZVersionDiffRecord",
     a_zi, a_icu, lt_paris, "dir", {}},
    // Beyond long: strtol's ERANGE is what errno holds at the last resort.
    {"system_version_out_of_range",
     on_a + "put_file /usr/share/zoneinfo.default/+VERSION 99999999999999999999a",
     a_zi, a_icu, lt_paris, none, {{unable, ERANGE}, {last_resort.message, ERANGE}}, ERANGE},
    // Every call before the failing parse succeeds, so errno is 0 and
    // cannot be the status.
    {"last_resort_without_errno", on_a + legacy_icu("/usr/share") +
         "put_file /var/db/icu x; put_file /usr/share/zoneinfo.default/+VERSION 99999999999a",
     a_zi, a_icu, lt_paris, none, {{unable, 0}, {last_resort.message, 0}}, 255},
    // No /var/db/timezone at all: not even the system data can be linked.
    {"last_resort_fails", sys + "rm -r /var/db/timezone",
     none, none, none, none,
     {{"Bad zoneinfo link ", ENOENT}, invalid, force_fails, {unable, ENOENT}, force_fails,
      last_resort}, ENOENT},
};
// clang-format on

INSTANTIATE_TEST_SUITE_P(decision, tool, ::testing::ValuesIn(decision_rows),
                         [](const auto& row) { return row.param.name; });

std::string
localtime(const std::string& target)
{
    return sys + link("zoneinfo", "/usr/share/zoneinfo.default") + link("localtime", target);
}

std::string
correcting(const std::string& target)
{
    return "Correcting localtime link to " + target;
}

const std::string on_system_no_lt = sys + link("zoneinfo", "/usr/share/zoneinfo.default");

// clang-format off
const scenario localtime_rows[] = {
    {"live_missing_zone_kept", localtime("/var/db/timezone/zoneinfo/Mars/Base"),
     sys_zi, none, "-> /var/db/timezone/zoneinfo/Mars/Base", none, {}},
    {"bare_prefix_kept", localtime("/var/db/timezone/zoneinfoX"),
     sys_zi, none, "-> /var/db/timezone/zoneinfoX", none, {}},
    {"legacy_rewritten", localtime("/usr/share/zoneinfo/Europe/Paris"),
     sys_zi, none, lt_paris, none,
     {{correcting("/var/db/timezone/zoneinfo/Europe/Paris"), ENOENT}}},
    {"legacy_missing_zone", localtime("/usr/share/zoneinfo/Mars/Base"),
     sys_zi, none, lt_default, none,
     {{correcting("/var/db/timezone/zoneinfo/Mars/Base"), ENOENT}, reset_lt}},
    {"legacy_default_dir", localtime("/usr/share/zoneinfo.default/Europe/Paris"),
     sys_zi, none, lt_default, none,
     {{correcting("/var/db/timezone/zoneinfo.default/Europe/Paris"), ENOENT}, reset_lt}},
    {"relative", localtime("../zoneinfo/Europe/Paris"),
     sys_zi, none, lt_default, none, {reset_lt}},
    {"missing", on_system_no_lt, sys_zi, none, lt_default, none, {reset_lt}},
    {"regular_file", on_system_no_lt + "put_file /var/db/timezone/localtime x",
     sys_zi, none, lt_default, none,
     {{"read_symlink: /var/db/timezone/localtime", EINVAL}, {reset_lt.message, EINVAL}}},
    {"directory_cannot_be_replaced", on_system_no_lt + "mkdir -p /var/db/timezone/localtime/x",
     sys_zi, none, "dir", none,
     {{"read_symlink: /var/db/timezone/localtime", EINVAL}, {reset_lt.message, EINVAL},
      {"create_symlink: from /var/db/timezone/localtime to "
       "/var/db/timezone/zoneinfo/America/Los_Angeles", EEXIST},
      {"correct_localtime_symlink() failed", EEXIST}}},
};
// clang-format on

INSTANTIATE_TEST_SUITE_P(localtime, tool, ::testing::ValuesIn(localtime_rows),
                         [](const auto& row) { return row.param.name; });

// The update 2024a.1.0 is current, with or without its icutz link.
const std::string on_a_no_icu =
    sys + update("2024a.1.0") + link("zoneinfo", a + "/zoneinfo") + paris;

const warned no_migration = {"Could not migrate /var/db/icutz to /var/db/timezone/icutz", EINVAL};

// clang-format off
const scenario housekeeping_rows[] = {
    {"legacy_icu_migrated", on_a_no_icu + legacy_icu(a + "/icutz"),
     a_zi, a_icu, lt_paris, none, {}, 0, "/var/db/icutz", none},
    {"legacy_icu_deleted_when_both_resolve", on_a + legacy_icu("/usr/share"),
     a_zi, a_icu, lt_paris, none, {}, 0, "/var/db/icutz", none},
    {"dangling_legacy_icu_stays", on_a + legacy_icu("/gone"),
     a_zi, a_icu, lt_paris, none, {}, 0, "/var/db/icutz", "-> /gone"},
    {"dangling_new_icu_blocks_migration",
     on_a_no_icu + link("icutz", "/gone") + legacy_icu(a + "/icutz"),
     a_zi, "-> /gone", lt_paris, none,
     {{"create_symlink: from /var/db/timezone/icutz to " + a + "/icutz", EEXIST},
      {no_migration.message, EEXIST}}, 0, "/var/db/icutz", none},
    // Copied byte for byte, the relative target now resolves elsewhere.
    {"legacy_icu_relative_copied_as_is", on_a_no_icu + legacy_icu("timezone/tz/2024a.1.0/icutz"),
     a_zi, "-> timezone/tz/2024a.1.0/icutz", lt_paris, none, {}, 0, "/var/db/icutz", none},
    {"legacy_icu_regular_file", on_a_no_icu + "put_file /var/db/icutz x",
     a_zi, none, lt_paris, none,
     {{"read_symlink: /var/db/icutz", EINVAL}, no_migration}, 0, "/var/db/icutz", none},
    {"legacy_icu_directory", on_a + "mkdir -p /var/db/icutz",
     a_zi, a_icu, lt_paris, none,
     {{"remove: could not remove /var/db/icutz", EISDIR}, {"Could not remove /var/db/icutz", EISDIR}},
     0, "/var/db/icutz", "dir"},
    {"legacy_icu_entry_removed", on_a + "put_link /usr/share /var/db/icu",
     a_zi, a_icu, lt_paris, none, {}, 0, "/var/db/icu", none},
    {"legacy_icu_full_directory_kept", on_a + "mkdir -p /var/db/icu/x",
     a_zi, a_icu, lt_paris, none, {}, 0, "/var/db/icu", "dir"},
};
// clang-format on

INSTANTIATE_TEST_SUITE_P(housekeeping, tool, ::testing::ValuesIn(housekeeping_rows),
                         [](const auto& row) { return row.param.name; });

} // namespace
