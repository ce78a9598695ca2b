# SPDX-License-Identifier: Apache-2.0
# Cross-builds for 64-bit Arm Linux with Debian's cross compiler
# (g++-aarch64-linux-gnu), whose headers and libraries live below the
# sysroot /usr/aarch64-linux-gnu.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR aarch64)

set(TZLINKS_AARCH64_SYSROOT /usr/aarch64-linux-gnu)
set(CMAKE_C_COMPILER aarch64-linux-gnu-gcc)
set(CMAKE_CXX_COMPILER aarch64-linux-gnu-g++)

# Look for libraries and packages of the target only, for build tools on the
# host only.
set(CMAKE_FIND_ROOT_PATH ${TZLINKS_AARCH64_SYSROOT})
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)

# The target's programs run on the build machine under user-mode QEMU, named
# explicitly because no binfmt handler can be relied on. The only programs
# CTest starts this way are the test binaries, and they need a private user
# and mount namespace: under QEMU, which runs threads of its own, a process
# can no longer create one itself, so unshare creates it before QEMU starts.
set(CMAKE_CROSSCOMPILING_EMULATOR unshare -Urm qemu-aarch64 -L ${TZLINKS_AARCH64_SYSROOT})
