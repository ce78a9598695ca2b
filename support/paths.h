// SPDX-License-Identifier: Apache-2.0
// Every fixed path of a device, in one place: the boot tool, the report and
// the update tool must agree on each of them to the byte, and a typo in one
// copy would send one program to the wrong entry without anything noticing.
#ifndef TZLINKS_SUPPORT_PATHS_H
#define TZLINKS_SUPPORT_PATHS_H

namespace velm_path {

// The link directory, and what the boot tool keeps in it.
inline constexpr char link_directory[] = "/var/db/timezone";
inline constexpr char zoneinfo_link[] = "/var/db/timezone/zoneinfo";
inline constexpr char icutz_link[] = "/var/db/timezone/icutz";
inline constexpr char localtime_link[] = "/var/db/timezone/localtime";
inline constexpr char latest_link[] = "/var/db/timezone/tz_latest";
inline constexpr char record[] = "/var/db/timezone/TZVersionDiffRecord";
// Updates lie in directories named by their version below this prefix.
inline constexpr char updates[] = "/var/db/timezone/tz/";
// The data-protection calls name both directories with a trailing '/'.
inline constexpr char link_directory_slash[] = "/var/db/timezone/";

// The system partition's data.
inline constexpr char system_zoneinfo[] = "/usr/share/zoneinfo.default";
inline constexpr char system_icu[] = "/usr/share/icu";

// Where older systems kept the live tz database, the zone a localtime link
// that cannot be kept falls back on, and that link's target.
inline constexpr char legacy_zoneinfo[] = "/usr/share/zoneinfo";
inline constexpr char default_zone[] = "America/Los_Angeles";
inline constexpr char default_localtime[] = "/var/db/timezone/zoneinfo/America/Los_Angeles";

// Entries that older systems left in /var/db.
inline constexpr char legacy_icu_link[] = "/var/db/icutz";
inline constexpr char legacy_icu[] = "/var/db/icu";

// Where programs read the device's zone from: a link through localtime.
inline constexpr char etc_localtime[] = "/etc/localtime";

} // namespace velm_path

#endif
