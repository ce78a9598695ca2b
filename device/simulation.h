// SPDX-License-Identifier: Apache-2.0
// A device tree read through a directory, its root, and never changed:
// calls that would change it are kept in memory, and later calls see them.
// Paths and absolute link targets are resolved inside the root, one
// component at a time, so nothing outside it is ever reached. A change is
// refused as the kernel would refuse it to the boot: on a read-only file
// system, an immutable entry, or one the boot's user may not change.
#ifndef TZLINKS_DEVICE_SIMULATION_H
#define TZLINKS_DEVICE_SIMULATION_H

#include "support/fs.h"

#include <map>
#include <optional>
#include <set>
#include <string>
#include <sys/types.h>
#include <vector>

// What stands at a path.
struct velm_entry {
    enum kind_t { absent, link, file, directory, fifo, socket, device } kind = absent;
    std::string text;    // a link's target; a file's content, when it is a new one
    int error = 0;       // why the path could not be looked up or the link read, or 0
    bool shared = false; // a regular file with other names (hard links)
    bool fresh = false;  // made by the simulation: nothing real stands behind it
    mode_t mode = 0;     // permission bits
    int base = -1;       // where it really lies: below this directory ...
    std::string real;    // ... at this path ("" for base itself, else "/a/b")
};

// The names in a directory, each with what stands there.
using velm_names = std::map<std::string, velm_entry::kind_t>;

class velm_simulation final : public velm_system_calls {
  public:
    explicit velm_simulation(int root_fd);
    ~velm_simulation() override;
    velm_simulation(const velm_simulation&) = delete;
    velm_simulation& operator=(const velm_simulation&) = delete;

    int unlink(const char* path) override;
    int access(const char* path) override;
    ssize_t readlink(const char* path, char* buffer, size_t size) override;
    int symlink(const char* target, const char* path) override;
    int remove(const char* path) override;
    int open(const char* path, int flags, mode_t mode) override;
    void io_failed(const std::string& path, int error) override;

    // The entry at path, its last component not followed (or followed);
    // with where it leads inside the root, when canonical is given.
    velm_entry look(const std::string& path, bool follow = false, std::string* canonical = nullptr);
    // The entry at a canonical path (as look gives it), nothing followed:
    // for the names of a directory already resolved, the quickest look.
    velm_entry at(const std::string& canonical) { return entry_at(canonical); }
    // Up to limit bytes of the file at path, following links; none when it
    // is no regular file or cannot be read. A cut shows as limit bytes.
    std::optional<std::string> read(const std::string& path, size_t limit);
    // The names in the directory at path, as a listing shows them now,
    // with their kinds; none when it is no directory or cannot be listed.
    std::optional<velm_names> names(const std::string& path);
    // Puts made at the canonical path, as a change of the tree's.
    void put(const std::string& canonical, const velm_entry& made);
    // Makes path a copy of the directory below outside, which lies outside
    // the root (an update about to be staged).
    void graft(const std::string& path, int outside);
    // Whether the boot may add or remove entries in a directory: 0, or the
    // error the kernel gives it.
    int may_change_in(const std::string& directory);
    // The simulated changes so far, to come back to.
    using changes = std::map<std::string, velm_entry>;
    changes checkpoint();
    void rewind(const changes& to);
    // Where path leads inside the root, its last component not followed
    // (or followed).
    std::string where(const std::string& path, bool follow = false)
    {
        std::string canonical;
        look(path, follow, &canonical);
        return canonical;
    }
    // Whether the file at path was written since the writes were forgotten
    // (as a run of the boot begins).
    bool written(const std::string& path);
    void forget_writes();

    // Whether changes are judged with the boot's own credentials (root);
    // otherwise only read-only file systems are foreseen.
    bool as_boot() const { return as_root; }
    // Paths the simulation could not read, or read only in part (EFBIG),
    // with the error; and those it tried again from the beginning.
    const std::map<std::string, int>& unread() const { return trouble; }
    void forget_unread() { trouble.clear(); }
    // The changes the tree refused (an unlink, a new link), in order: the
    // path as the call named it, and the error.
    std::vector<std::pair<std::string, int>> refusals;

  private:
    velm_entry real_entry(int base, const std::string& real);
    velm_entry entry_at(const std::string& canonical);
    velm_entry resolve(const std::string& path, bool follow, std::string& canonical);
    int may_write(const velm_entry& entry);
    int may_remove(const char* path, std::string& canonical, velm_entry& entry);
    int unlink_entry(const char* path);
    int open_for_writing(const std::string& canonical, const velm_entry& entry);
    int open_for_reading(const std::string& canonical, const velm_entry& entry, int flags);
    void settle();
    int fail(int error);

    int root;
    bool as_root;
    std::map<std::string, velm_entry> changed; // canonical path -> entry
    std::set<std::string> writes;
    std::vector<std::pair<int, std::string>> pending; // files open for writing
    std::map<std::string, int> trouble;
    std::map<std::pair<int, std::string>, velm_entry> looked; // real entries, as looked up
    std::map<std::pair<int, std::string>, std::pair<int, velm_names>> listed; // and listings
};

#endif
