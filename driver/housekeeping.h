// SPDX-License-Identifier: Apache-2.0
// Housekeeping done before any dataset is looked at. Neither reports a
// failure to the caller.
#ifndef TZLINKS_DRIVER_HOUSEKEEPING_H
#define TZLINKS_DRIVER_HOUSEKEEPING_H

// Gives /var/db/timezone/, then /var/db/timezone/tz/, the data-protection
// class that keeps them readable at boot before first unlock.
void protect_data_directories();
// Moves the ICU link from /var/db/icutz to /var/db/timezone/icutz.
void migrate_icu_link();

#endif
