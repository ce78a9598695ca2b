// File-system primitives. Each one either succeeds or warns on standard
// error and throws the errno of the failed call as a plain int.
//
// They live in their own namespace so that velm_fs::remove (unlink, warns
// and throws) is never confused with the C library's remove(3), which some
// callers use on purpose because they do not care whether it worked.
#ifndef TZLINKS_SUPPORT_FS_H
#define TZLINKS_SUPPORT_FS_H

#include <string>

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
