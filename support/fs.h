// SPDX-License-Identifier: Apache-2.0
// File-system primitives. Each one either succeeds or warns on standard
// error and throws the errno of the failed call as a plain int.
//
// They live in their own namespace so that velm_fs::remove (unlink, warns
// and throws) is never confused with the C library's remove(3), which some
// callers use on purpose because they do not care whether it worked.
#ifndef TZLINKS_SUPPORT_FS_H
#define TZLINKS_SUPPORT_FS_H

#include <string>
#include <sys/types.h>

// The calls the start-up sequence makes on the file system, each as the
// system call or C library function it stands for: -1 and errno on
// failure. tzlinks makes them for real; tzlinks-status puts a simulation in
// their place and runs the very same sequence to show what the next boot
// will do, without doing it.
class velm_system_calls {
  public:
    virtual int unlink(const char* path) const;
    virtual int access(const char* path) const; // F_OK: does it resolve?
    virtual ssize_t readlink(const char* path, char* buffer, size_t size) const;
    virtual int symlink(const char* target, const char* path) const;
    // remove(3): a file, a link or an empty directory.
    virtual int remove(const char* path) const;
    // Opens for reading only, never blocking: flags may add O_DIRECTORY.
    virtual int open_for_reading(const char* path, int flags) const;
    // Replaces the content of a regular file, created when missing, and
    // leaves anything else at path alone, a link included (the link is not
    // followed). Nobody is told whether it worked.
    virtual void write_file(const char* path, const std::string& text) const;
    // open, fcntl F_SETPROTECTIONCLASS where the platform has it, close;
    // every failure ignored.
    virtual void set_protection_class(const char* path, int protection_class) const;
};

// The calls in use: the real ones unless use_system_calls said otherwise.
const velm_system_calls& system_calls();
void use_system_calls(const velm_system_calls& calls);

namespace velm_fs {

// unlink(2); an entry that is already gone is not a failure.
void remove(const std::string& path);

// access(2) with F_OK: follows links, so a dangling link is "missing".
bool path_exists(const std::string& path);

// readlink(2) into a 1025-byte buffer; targets longer than 1024 bytes are
// cut. A missing entry yields the empty string.
std::string read_symlink(const std::string& path);

// symlink(2), target first as in the system call. Never replaces an entry.
void create_symlink(const std::string& target, const std::string& link_path);

} // namespace velm_fs

#endif
