# SPDX-License-Identifier: BSD-2-Clause
# Run by cpack on what it is about to pack: what Debian wants in a package beside an installation.
set(share ${CPACK_TEMPORARY_INSTALL_DIRECTORY}/usr/share)
set(doc ${share}/doc/otrp)

file(COPY ${CMAKE_CURRENT_LIST_DIR}/copyright DESTINATION ${doc})
file(REMOVE ${doc}/LICENSE)  # in the copyright file
file(RENAME ${doc}/CHANGELOG.md ${doc}/changelog)
file(COPY_FILE ${CMAKE_CURRENT_LIST_DIR}/changelog ${doc}/changelog.Debian)
file(MAKE_DIRECTORY ${share}/lintian/overrides)
file(COPY_FILE ${CMAKE_CURRENT_LIST_DIR}/lintian-overrides ${share}/lintian/overrides/otrp)

file(GLOB pages ${share}/man/*/*)
execute_process(COMMAND gzip -9n ${pages} ${doc}/changelog ${doc}/changelog.Debian
  COMMAND_ERROR_IS_FATAL ANY)
