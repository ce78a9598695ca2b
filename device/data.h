// SPDX-License-Identifier: Apache-2.0
// What both tools read of a device's data, each rule in one place: the
// update a path lies in, the words and files the boot itself finds (read by
// the boot's own code, through the simulation), and the magic numbers that
// tell a zone file and ICU data from anything else.
#ifndef TZLINKS_DEVICE_DATA_H
#define TZLINKS_DEVICE_DATA_H

#include "device/simulation.h"

#include <set>
#include <string>

// The update a path lies in, /var/db/timezone/tz/NAME; "" for a path in
// none.
std::string velm_update_of(const std::string& path);
// The update a path leads into, resolved inside the tree (following its
// last link too, or not), as the boot names updates: /var/db/timezone/tz/
// NAME, whatever links lead there; "" for none.
std::string velm_update_at(velm_simulation& tree, const std::string& path, bool follow = true);
// The updates the links zoneinfo, icutz and tz_latest name, read as the
// boot reads them or followed inside the tree. A read that fails is named
// in unread, if given: what it hides could be a name.
std::set<std::string> velm_named_updates(velm_simulation& tree, std::string* unread = nullptr);
// The first word of a file, as the boot reads +VERSION.
std::string velm_first_word(velm_simulation& tree, const std::string& path);
// The ICU data file the boot takes in an update's icutz directory, as a
// path; "" when it takes none.
std::string velm_icu_file(velm_simulation& tree, const std::string& directory);
// Whether the file at path begins as a compiled zone file does ("TZif").
bool velm_zone_file(velm_simulation& tree, const std::string& path);
// Whether the file at path begins as ICU's data files do: a header size,
// then the bytes 0xda 0x27.
bool velm_icu_data(velm_simulation& tree, const std::string& path);

#endif
