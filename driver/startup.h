// SPDX-License-Identifier: Apache-2.0
#ifndef TZLINKS_DRIVER_STARTUP_H
#define TZLINKS_DRIVER_STARTUP_H

// Exit status when even the last-resort reset fails and errno cannot serve
// as the status (0, or above 255). Not an errno value on any platform this
// tool runs on, so it is never mistaken for one.
const int last_resort_unknown_status = 255;

// One whole run of the tool; returns the exit status: 0 whenever the run
// reaches its end, errno (or last_resort_unknown_status) when even the
// last-resort reset fails, and the run stops there.
int run_startup_sequence();

#endif
