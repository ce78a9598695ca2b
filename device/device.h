// SPDX-License-Identifier: Apache-2.0
// A device tree below a root: the device itself, or an image or a copy of
// one below a directory. Every path of the device is resolved inside the
// root, as systemd's chase() resolves it: one component at a time, an
// absolute link target taken from the root, ".." never above it. Reads go
// through a simulation of the tree, and so do the boot's runs; the real
// changes of tzlinks-update are made below directories opened by what the
// simulation resolved, and nothing above or beside the root is ever read or
// written.
#ifndef TZLINKS_DEVICE_DEVICE_H
#define TZLINKS_DEVICE_DEVICE_H

#include <string>

struct velm_device {
    std::string root; // how commands and messages name the tree: "" for /
    int fd = -1;      // the root directory

    // A path of the device as it lies in the tree below a root: the
    // directory it lies in resolved inside the root, since the host, given
    // DIR/path, would follow an absolute link on its way out of DIR. The
    // device's own paths stay as they are.
    std::string real(const std::string& path) const;
    // A path of the device as messages and commands name it to the host.
    std::string named(const std::string& path) const { return root + real(path); }
    // The directory at path, opened for real: resolved inside the root,
    // then opened name by name without following any link, so that what a
    // racing change made a link is refused (ELOOP, ENOTDIR) rather than
    // followed. -1 and errno when it cannot be opened. real, when given,
    // gets the path it has below the root, as the host names it.
    int open_directory(const std::string& path, std::string* real = nullptr) const;
};

// Opens the tree below dir, or the device's own when dir is null: 0, or
// EX_NOINPUT, said on standard error, when it cannot be opened or holds no
// device (directories var/ and usr/share/ below it).
int open_device(const char* dir, velm_device& device);

#endif
