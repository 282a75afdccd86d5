# SPDX-License-Identifier: BSD-2-Clause
# What an installation holds: the programs, the host TEE's library with its TA images, and what is
# needed to write a client of it.
set(otrp_data_dir ${CMAKE_INSTALL_DATADIR}/otrp)
set(otrp_ta_dir ${CMAKE_INSTALL_LIBDIR}/otrp/ta)  # beside the library, which looks there
set(otrp_cmake_dir ${CMAKE_INSTALL_LIBDIR}/cmake/otrp-tee)

# Programs find the library beside them, wherever the whole was moved to; images are loaded by it. A
# path of the build's own would end in an empty element, which is the current directory.
file(RELATIVE_PATH bin_to_lib /bin /${CMAKE_INSTALL_LIBDIR})
set(otrp_programs otrp-device otrp-fleet otrp-tsm)
set_target_properties(${otrp_programs} PROPERTIES INSTALL_RPATH "$ORIGIN/${bin_to_lib}")
set_target_properties(${otrp_programs} tee otrp_agent_image corvel_image PROPERTIES
  BUILD_WITH_INSTALL_RPATH ON)

install(TARGETS ${otrp_programs} RUNTIME)
install(TARGETS tee EXPORT otrp-tee LIBRARY)
install(TARGETS otrp_agent_image corvel_image LIBRARY DESTINATION ${otrp_ta_dir})
install(FILES tee/include/tee_client_api.h tee/include/tee_inspect.h
  ${CMAKE_BINARY_DIR}/include/otrp.h
  DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/otrp)
install(FILES keys/dev-ca-tsm.pem DESTINATION ${otrp_data_dir})

install(FILES docs/man/otrp-device.1 docs/man/otrp-fleet.1 docs/man/otrp-tsm.1
  DESTINATION ${CMAKE_INSTALL_MANDIR}/man1)
install(FILES docs/man/otrp-tee.3 DESTINATION ${CMAKE_INSTALL_MANDIR}/man3)
install(FILES docs/man/otrp.7 DESTINATION ${CMAKE_INSTALL_MANDIR}/man7)
foreach(program ${otrp_programs})
  install(FILES tools/completion/otrp.bash
    DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions RENAME ${program})
endforeach()
install(FILES LICENSE NOTICE CHANGELOG.md DESTINATION ${CMAKE_INSTALL_DOCDIR})
install(FILES ${CMAKE_BINARY_DIR}/otrp.spdx.json DESTINATION ${CMAKE_INSTALL_DOCDIR} OPTIONAL)
file(GLOB examples CONFIGURE_DEPENDS docs/examples/*.json docs/examples/*.c)
install(FILES ${examples} DESTINATION ${CMAKE_INSTALL_DOCDIR}/examples)
install(PROGRAMS tests/stranger/tsm.py DESTINATION ${CMAKE_INSTALL_DOCDIR}/examples)

# Pages with parts for the source alone, and others, in comments, for what is installed.
file(MAKE_DIRECTORY ${CMAKE_BINARY_DIR}/installed)
foreach(page README.md docs/protocol.md)
  cmake_path(GET page FILENAME name)
  set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${page})
  execute_process(
    COMMAND sed -e "/^<!-- source -->$/,/^<!-- end -->$/d" -e "/^<!-- package$/d" -e "/^-->$/d" ${page}
    WORKING_DIRECTORY ${PROJECT_SOURCE_DIR}
    OUTPUT_FILE ${CMAKE_BINARY_DIR}/installed/${name} COMMAND_ERROR_IS_FATAL ANY)
  install(FILES ${CMAKE_BINARY_DIR}/installed/${name} DESTINATION ${CMAKE_INSTALL_DOCDIR})
endforeach()

# ---- For clients: find_package(otrp-tee) and pkg-config otrp-tee

include(CMakePackageConfigHelpers)
install(EXPORT otrp-tee NAMESPACE otrp:: FILE otrp-tee-config.cmake DESTINATION ${otrp_cmake_dir})
write_basic_package_version_file(otrp-tee-config-version.cmake COMPATIBILITY SameMinorVersion)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/otrp-tee-config-version.cmake
  DESTINATION ${otrp_cmake_dir})
file(RELATIVE_PATH pc_to_prefix /${CMAKE_INSTALL_LIBDIR}/pkgconfig /)
configure_file(cmake/otrp-tee.pc.in otrp-tee.pc @ONLY)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/otrp-tee.pc
  DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

# ---- Packages: cpack -G DEB

set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME otrp)
set(CPACK_PACKAGE_VENDOR "OTrP device side authors")
set(CPACK_PACKAGE_CONTACT "OTrP device side authors <authors@otrp.invalid>")
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "device side of the Open Trust Protocol")
set(CPACK_PACKAGE_DESCRIPTION
"An OTrP agent for GlobalPlatform TEEs, a TEE to run it on any Linux machine,
a key service, and command lines for the device and for a Trusted Service
Manager, with what is needed to write other clients of the TEE.

It is for development and simulation: the TEE isolates nothing.")
set(CPACK_STRIP_FILES ON)
set(CPACK_VERBATIM_VARIABLES ON)
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_RELEASE 1)
set(CPACK_DEBIAN_PACKAGE_SECTION utils)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_PACKAGE_CONTROL_EXTRA ${PROJECT_SOURCE_DIR}/cmake/package/triggers)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
set(CPACK_PRE_BUILD_SCRIPTS ${PROJECT_SOURCE_DIR}/cmake/package/finish.cmake)
include(CPack)
