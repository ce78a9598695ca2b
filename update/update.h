// SPDX-License-Identifier: Apache-2.0
// tzlinks-update: puts an update on a device safely, judged by the boot's
// own code run on a simulation of the device with the update in place.
#ifndef TZLINKS_UPDATE_UPDATE_H
#define TZLINKS_UPDATE_UPDATE_H

#include "device/boot.h"
#include "device/device.h"

#include <optional>
#include <string>
#include <vector>

// The verdicts of check, its exit statuses.
enum velm_verdict { adopted_clean = 0, adopted_with_warnings = 1, refused = 2 };

// What makes an update unusable (an error, which nothing overrides) or not
// the device's (a warning: the boot's judgement, which --force overrides).
struct velm_problem {
    std::string id, severity, subject, message, manual;
};

// What a walk of SRC found: its problems, and its links (paths below it),
// to be judged where they lead once the update is in place.
struct velm_source {
    std::vector<velm_problem> problems;
    std::vector<std::string> links;
    size_t unsafe = 0;
    unsigned long long bytes = 0;
};

// Walks the tree below src, by descriptor and never following a link,
// and copies it into the empty directory to: directories 0755, files 0644,
// links as they read; what is unsafe to copy is left out, and a problem.
// name is how SRC is named. False when the copy could not be written,
// said on standard error.
bool walk_source(int src, int to, const std::string& name, velm_source& found);
// An entry of SRC, at path below it, that makes it unsafe; and the line
// that counts those beyond the first few.
void note_unsafe(velm_source& found, const std::string& name, const std::string& path,
                 const std::string& why);
void finish_unsafe(velm_source& found, const std::string& name);
// The release SRC's tz database names: the first word of its
// zoneinfo/+VERSION; "" when there is none.
std::string source_release(int src);

// An update, and what the next boot makes of it.
struct velm_judgement {
    std::string version;                // the name it takes below tz/
    std::vector<velm_problem> problems; // of SRC, then the boot's refusal
    velm_run next_boot;                 // with the update in place and named
    bool adopts = false;                // that boot adopts it
    std::optional<velm_run> after;      // the boot after it, when it does
    velm_verdict verdict = refused;
    std::string unread; // a path of the device that could not be read
    int error = 0;      // and why: nothing is judged on it
};

// The longest version stage can make its staging directory from,
// ".stage-V.xxxxxxxx", within NAME_MAX; a longer one is refused.
extern const size_t longest_version;

// Judges the update below fd (SRC, or its staged copy) as version.
velm_judgement judge(const velm_device& device, int fd, const velm_source& walked,
                     const std::string& name, const std::string& version);
// Copies src into the empty directory copy and judges the copy: 0, or
// EX_IOERR, said with the consequence, when the copy or a read failed.
int copy_and_judge(const velm_device& device, int src, int copy, const std::string& name,
                   const std::string& version, const char* consequence, velm_judgement& j);
bool unusable(const velm_judgement& j);
std::string judgement_text(const velm_judgement& j, const std::string& name);
std::string judgement_json(const velm_judgement& j, const std::string& name);

// Takes the lock of tzlinks-update's changes in the link directory links,
// waiting at most seconds: 0, or EX_TEMPFAIL when it is still held (its
// holder named when that can be told), EX_IOERR when it cannot be taken.
// A lock entry that is no regular file wedges every caller: with clear,
// it is removed first.
int take_lock(const velm_device& device, int links, int seconds, bool clear);

// Copies src into tz/version and names it with tz_latest; the exit status.
int stage(const velm_device& device, int links, int src, const std::string& name,
          const std::string& version, bool force);
// Removes what no link names below tz/, and what an interrupted stage left.
int prune(const velm_device& device, int links, bool dry_run);

#endif
