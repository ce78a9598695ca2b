// SPDX-License-Identifier: Apache-2.0
#ifndef TZLINKS_DRIVER_LOCALTIME_H
#define TZLINKS_DRIVER_LOCALTIME_H

// Makes /var/db/timezone/localtime point into the live zoneinfo tree:
// keeps a link that does, rewrites one into /usr/share/zoneinfo, and resets
// anything else to America/Los_Angeles. Throws only when that reset fails.
void correct_localtime_symlink();

#endif
