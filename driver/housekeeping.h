// SPDX-License-Identifier: Apache-2.0
// Housekeeping done before any dataset is looked at. None of these report
// a failure to the caller.
#ifndef TZLINKS_DRIVER_HOUSEKEEPING_H
#define TZLINKS_DRIVER_HOUSEKEEPING_H

#include <string>

// Gives path the data-protection class that keeps it readable at boot
// before first unlock. Silent on every failure.
void set_protection_class(const std::string& path);
// /var/db/timezone/, then /var/db/timezone/tz/.
void protect_data_directories();
// Moves the ICU link from /var/db/icutz to /var/db/timezone/icutz.
void migrate_icu_link();

#endif
