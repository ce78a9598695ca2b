# SPDX-License-Identifier: Apache-2.0
# Provides GoogleTest to the test suite. A native build links Debian's
# prebuilt library; a cross build, a build against libc++ (the prebuilt one
# is made for libstdc++) or a machine that lacks the library compiles it for
# the target from Debian's source package, and the later find_package(GTest)
# is answered by that in-tree build.
set(TZLINKS_GOOGLETEST_SOURCE /usr/src/googletest
    CACHE PATH "GoogleTest sources, used when no prebuilt library fits the target")

if(NOT CMAKE_CROSSCOMPILING AND NOT CMAKE_CXX_FLAGS MATCHES "-stdlib=libc\\+\\+")
    find_package(GTest QUIET)
endif()

if(NOT GTest_FOUND)
    include(FetchContent)
    # Test scaffolding only: nothing of it may land in an installed system.
    set(INSTALL_GTEST OFF CACHE BOOL "" FORCE)
    set(BUILD_GMOCK OFF CACHE BOOL "" FORCE)
    FetchContent_Declare(GTest SOURCE_DIR ${TZLINKS_GOOGLETEST_SOURCE} OVERRIDE_FIND_PACKAGE)
    FetchContent_MakeAvailable(GTest)
endif()
