// SPDX-License-Identifier: Apache-2.0
// File-system primitives, and the seam through which they reach the file
// system.
//
// The primitives live in their own namespace so that velm_fs::remove
// (unlink, warns and throws) is never confused with the C library's
// remove(3), which some callers use on purpose because they do not care
// whether it worked.
#ifndef TZLINKS_SUPPORT_FS_H
#define TZLINKS_SUPPORT_FS_H

#include <string>
#include <sys/types.h>
#include <vector>

// Every call the boot tool makes on a path goes through this seam, each as
// the system call or C library function it stands for: -1 and errno on
// failure. tzlinks makes them for real; tzlinks-status and tzlinks-update
// put a simulated file system in their place and run the very same start-up
// sequence to show what the next boot will do, without doing it.
//
// Calls on a descriptor (fstat, read, write, ftruncate, close, getdents64,
// fstatat below a directory, fcntl) do not go through the seam: a
// simulation hands out real descriptors, of the real file or of an
// anonymous copy, on which those calls behave as they would at boot.
class velm_system_calls {
  public:
    virtual ~velm_system_calls() = default;
    virtual int unlink(const char* path);
    virtual int access(const char* path); // F_OK: does it resolve?
    virtual ssize_t readlink(const char* path, char* buffer, size_t size);
    virtual int symlink(const char* target, const char* path);
    virtual int remove(const char* path); // remove(3): a file, a link or an empty directory
    virtual int open(const char* path, int flags, mode_t mode = 0);
    // Told of a call on a descriptor that failed (a listing, a file's
    // bytes read or written, fstat): the boot goes on as if there were
    // nothing there, but a watcher must not take that for an absence.
    // Nothing, for real.
    virtual void io_failed(const std::string& /*path*/, int /*error*/) {}
};

// The calls in use: the real ones, but while a velm_calls_in_use lives.
velm_system_calls& system_calls();

// Puts other calls in use for as long as it lives, on every way out.
class velm_calls_in_use {
  public:
    explicit velm_calls_in_use(velm_system_calls& calls);
    ~velm_calls_in_use();
    velm_calls_in_use(const velm_calls_in_use&) = delete;
    velm_calls_in_use& operator=(const velm_calls_in_use&) = delete;

  private:
    velm_system_calls* saved;
};

namespace velm_fs {

// Every primitive below but path_exists and write_own_file warns on
// standard error and throws the errno of the failed call as a plain int.

// unlink(2); an entry that is already gone is not a failure.
void remove(const std::string& path);

// access(2) with F_OK: follows links, so a dangling link is "missing".
// Never warns or throws.
bool path_exists(const std::string& path);

// readlink(2) into a 1025-byte buffer; targets longer than 1024 bytes are
// cut. A missing entry yields the empty string.
std::string read_symlink(const std::string& path);

// symlink(2), target first as in the system call. Never replaces an entry.
void create_symlink(const std::string& target, const std::string& link_path);

// The whole target of the link name below the directory dir, however long
// (readlinkat(2), read again into a larger buffer until it fits): 0, or the
// errno of the failed call. Never warns.
int read_link_at(int dir, const std::string& name, std::string& target);

// The names in the directory dir, but for "." and "..": 0, or the errno of
// the listing that failed (names then holds what was read). Never warns.
// With types, each name's d_type too (DT_UNKNOWN where the file system
// does not tell).
int names_in(int dir, std::vector<std::string>& names, std::vector<unsigned char>* types = nullptr);

// Replaces the content of the regular file at path, created when missing,
// and leaves anything else there alone: a link (not followed), a FIFO, a
// device, a directory, or a file with other names. Never warns or throws;
// nobody is told whether it worked.
void write_own_file(const std::string& path, const std::string& text);

} // namespace velm_fs

#endif
