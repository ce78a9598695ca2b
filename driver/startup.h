// SPDX-License-Identifier: Apache-2.0
#ifndef TZLINKS_DRIVER_STARTUP_H
#define TZLINKS_DRIVER_STARTUP_H

// What the start-up sequence says when it sets data aside or gives up: the
// account of its decisions that tzlinks-status reads off a simulated run.
namespace velm_says {
inline constexpr char invalid_current[] = "Invalid current symlinks; resetting to system partition";
inline constexpr char incompatible[] = "Symlink points at data incompatible with installed system";
inline constexpr char refused[] = "New update not compatible or older version";
inline constexpr char unable[] = "Unable to locate data; resetting to system partition";
inline constexpr char last_resort[] = "Last resort force_system_dataset() failed";
} // namespace velm_says

// One whole run of the tool; returns the exit status: 0 whenever the run
// reaches its end, errno (or last_resort_unknown_status) when even the
// last-resort reset fails, and the run stops there.
int run_startup_sequence();

#endif
