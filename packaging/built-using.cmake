# SPDX-License-Identifier: Apache-2.0
# Run by CPack on the finished package of statically linked programs. They
# contain code of the C library, whose licence (LGPL-2.1+) requires its
# source to stay available: Built-Using names the glibc source they were
# linked from. CPack writes no such field, so it is added here.
execute_process(COMMAND ${CPACK_TZLINKS_CXX_COMPILER} -print-file-name=libc.a
                OUTPUT_VARIABLE libc OUTPUT_STRIP_TRAILING_WHITESPACE COMMAND_ERROR_IS_FATAL ANY)
file(REAL_PATH ${libc} libc)
execute_process(COMMAND dpkg-query -S ${libc} OUTPUT_VARIABLE owner COMMAND_ERROR_IS_FATAL ANY)
string(REGEX REPLACE ":.*" "" owner "${owner}")
execute_process(COMMAND dpkg-query -W "-f=\${Built-Using}|\${source:Package} (= \${source:Version})"
                        ${owner} OUTPUT_VARIABLE fields COMMAND_ERROR_IS_FATAL ANY)
# A cross compiler's C library is built from glibc by another source
# package, and names that glibc in its own Built-Using.
if(fields MATCHES "glibc \\(= [^)]*\\)")
    set(glibc ${CMAKE_MATCH_0})
else()
    string(REGEX REPLACE ".*\\|" "" glibc "${fields}")
endif()

set(tree ${CPACK_TOPLEVEL_DIRECTORY}/built-using)
foreach(deb IN LISTS CPACK_PACKAGE_FILES)
    file(REMOVE_RECURSE ${tree})
    execute_process(COMMAND dpkg-deb -R ${deb} ${tree} COMMAND_ERROR_IS_FATAL ANY)
    file(READ ${tree}/DEBIAN/control control)
    string(STRIP "${control}" control)
    file(WRITE ${tree}/DEBIAN/control "${control}\nBuilt-Using: ${glibc}\n")
    execute_process(COMMAND dpkg-deb --root-owner-group -Zxz -b ${tree} ${deb}
                    OUTPUT_QUIET COMMAND_ERROR_IS_FATAL ANY)
endforeach()
file(REMOVE_RECURSE ${tree})
