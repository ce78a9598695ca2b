# SPDX-License-Identifier: Apache-2.0
# Read by CPack before it makes the package: Debian's name for the
# architecture the compiler targets (arm64 for aarch64-linux-gnu), so that
# a cross build is not named for the build machine. Asked only here, so
# that configuring a build needs no dpkg-dev.
execute_process(COMMAND ${CPACK_TZLINKS_CXX_COMPILER} -dumpmachine
                OUTPUT_VARIABLE triplet OUTPUT_STRIP_TRAILING_WHITESPACE COMMAND_ERROR_IS_FATAL ANY)
execute_process(COMMAND dpkg-architecture -t ${triplet} -qDEB_HOST_ARCH
                OUTPUT_VARIABLE CPACK_DEBIAN_PACKAGE_ARCHITECTURE
                OUTPUT_STRIP_TRAILING_WHITESPACE COMMAND_ERROR_IS_FATAL ANY)
