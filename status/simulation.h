// SPDX-License-Identifier: Apache-2.0
// A device tree read through a directory, its root, and never changed:
// calls that would change it are kept in memory, and later calls see them.
// Paths and absolute link targets are resolved inside the root, one
// component at a time, so nothing outside it is ever reached.
#ifndef TZLINKS_STATUS_SIMULATION_H
#define TZLINKS_STATUS_SIMULATION_H

#include "support/fs.h"

#include <map>
#include <string>

// What stands at a path.
struct velm_entry {
    enum kind_t { absent, link, file, directory, other } kind = absent;
    std::string text;    // a link's target; a simulated file's content
    int error = 0;       // why the path could not be looked up, or 0
    bool shared = false; // a file with other names (hard links)
};

class velm_simulation final : public velm_system_calls {
  public:
    explicit velm_simulation(int root_fd) : root(root_fd) {}

    int unlink(const char* path) const override;
    int access(const char* path) const override;
    ssize_t readlink(const char* path, char* buffer, size_t size) const override;
    int symlink(const char* target, const char* path) const override;
    int remove(const char* path) const override;
    int open_for_reading(const char* path, int flags) const override;
    void write_file(const char* path, const std::string& text) const override;
    void set_protection_class(const char* path, int protection_class) const override;

    // The entry at path, its last component not followed (or followed).
    velm_entry look(const std::string& path, bool follow = false) const;
    // Forgets every simulated change.
    void reset() { changed.clear(); }
    // Paths written by write_file since the last reset.
    bool written(const std::string& path) const;

  private:
    velm_entry real_entry(const std::string& canonical) const;
    velm_entry entry_at(const std::string& canonical) const;
    velm_entry resolve(const std::string& path, bool follow, std::string& canonical) const;
    bool empty_directory(const std::string& canonical) const;
    int fail(int error) const;

    int root;
    mutable std::map<std::string, velm_entry> changed; // canonical path -> entry
    mutable std::map<std::string, bool> writes;
};

#endif
