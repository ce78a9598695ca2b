# SPDX-License-Identifier: Apache-2.0
# The Debian package of this build: exactly what the install rules stage,
# for the architecture the build targets. "cpack" in the build directory
# makes it; tools/package also lists and checks it.
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME tzlinks)
set(CPACK_PACKAGE_VERSION ${PROJECT_VERSION})
set(CPACK_PACKAGE_CONTACT "tzlinks maintainers <maintainers@users.noreply.c-seed-df9883fe.example>")
set(CPACK_DEBIAN_PACKAGE_SECTION admin)
set(CPACK_DEBIAN_PACKAGE_PRIORITY optional)
set(CPACK_DEBIAN_PACKAGE_DESCRIPTION "time-zone dataset selection at boot
tzlinks runs once, early at every boot, and decides which time-zone dataset
the device uses: the one on the system partition or a newer downloaded
update. It expresses the decision only as symbolic links in
/var/db/timezone, before the clock is synchronised and before anything
reads time-zone data.

tzlinks-status reports, without changing anything, which dataset a device
or an image of one uses, what its next boot will do, what is wrong and the
commands that repair it. tzlinks-update checks, stages and prunes updates,
judged by the boot's own code before they are placed.")
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_COMPRESSION_TYPE xz)
set(CPACK_STRIP_FILES ON)
set(CPACK_DEBIAN_PACKAGE_CONTROL_EXTRA ${CMAKE_CURRENT_LIST_DIR}/postinst
                                       ${CMAKE_CURRENT_LIST_DIR}/postrm)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
# The unit directory lies outside the prefix, which takes an install with
# DESTDIR; the prefix then comes from CPACK_INSTALL_PREFIX.
set(CPACK_SET_DESTDIR ON)
set(CPACK_INSTALL_PREFIX /usr)

set(CPACK_TZLINKS_CXX_COMPILER ${CMAKE_CXX_COMPILER})
set(CPACK_PROJECT_CONFIG_FILE ${CMAKE_CURRENT_LIST_DIR}/architecture.cmake)
if(tzlinks_static)
    # Nothing to depend on; but the binaries hold glibc's code, which the
    # finished package names in Built-Using.
    set(CPACK_POST_BUILD_SCRIPTS ${CMAKE_CURRENT_LIST_DIR}/built-using.cmake)
else()
    set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
endif()
include(CPack)
