// SPDX-License-Identifier: Apache-2.0
// tzlinks-update: puts an update on a device safely, judged before it is
// placed by the boot's own code on a simulation of the device.
#ifndef TZLINKS_UPDATE_UPDATE_H
#define TZLINKS_UPDATE_UPDATE_H

#include "status/report.h"

#include <string>
#include <vector>

// Exit statuses beyond the usage (64), an unreadable SRC (66), a failed
// write (74) and a lock held too long (75).
enum velm_verdict { adopted_clean = 0, adopted_with_warnings = 1, refused = 2 };

// Where the program works: the device's own tree, or one below --root DIR.
struct velm_device {
    std::string root; // DIR, as commands and messages name it; "" for the device
    int fd = -1;      // the tree's root directory
    // A path of the device, as the system calls reach it.
    std::string at(const std::string& path) const { return root + path; }
};

// An update as it is to be unpacked, and what the next boot makes of it.
struct velm_judgement {
    std::string version;                // the name it takes below tz/
    std::vector<velm_finding> problems; // errors: unusable; warnings: the boot refuses it
    velm_run next_boot;                 // with the update staged and named by tz_latest
    bool adopts = false;                // that boot adopts it
    velm_report then;                   // the device after that boot
    velm_verdict verdict = refused;
};

// What makes the update below src unusable (errors) or not the device's
// (warnings): its version, its layout, its ICU data, the device's zone.
std::vector<velm_finding> examine_source(int src, const std::string& name,
                                         const std::string& version, const std::string& zone);
// The release an update's tz database names: the first word of its
// zoneinfo/+VERSION; "" when there is none.
std::string source_release(int src);

// Judges the update below src, staged as version on the device.
velm_judgement judge(const velm_device& device, int src, const std::string& name,
                     const std::string& version);
std::string judgement_text(const velm_judgement& j, const std::string& name,
                           const velm_device& device);
std::string judgement_json(const velm_judgement& j, const std::string& name,
                           const velm_device& device);

// Takes the lock of the update tool's changes, waiting at most seconds:
// 0, or 75 (the holder named) when it is still held then, 74 on failure.
int take_lock(const velm_device& device, int seconds);

// Copies src into tz/version and names it with tz_latest; the exit status.
int stage(const velm_device& device, int src, const std::string& version);
// Removes what no link names below tz/, and what an interrupted stage left.
int prune(const velm_device& device, bool dry_run);

#endif
