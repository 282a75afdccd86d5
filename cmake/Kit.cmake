# SPDX-License-Identifier: BSD-2-Clause
# What the two trusted applications are built against, and what a kit is told of them.

# The Internal Core API and the trace facility. A vendor's kit need not know the latter: its header
# declares the one function to map.
add_library(otrp_kit INTERFACE)
if(TEE_DEVKIT_INCLUDE)
  configure_file(${PROJECT_SOURCE_DIR}/tee/include/tee_trace.h
    ${CMAKE_BINARY_DIR}/generated/trace/tee_trace.h COPYONLY)
  target_include_directories(otrp_kit SYSTEM INTERFACE
    ${TEE_DEVKIT_INCLUDE} ${CMAKE_BINARY_DIR}/generated/trace)
  # Where uint32_t is a long, as in newlib, the conversions of log lines fit it, but not its name;
  # builds for the host TEE check them.
  target_compile_options(otrp_kit INTERFACE -Wno-format)
else()
  target_include_directories(otrp_kit INTERFACE ${PROJECT_SOURCE_DIR}/tee/include)
endif()
# Nothing unwinds the stack of a trusted application, and a kit's linker drops what it can.
if(OTRP_AGENT_ONLY)
  target_compile_options(otrp_kit INTERFACE
    -ffunction-sections -fdata-sections -fno-unwind-tables -fno-asynchronous-unwind-tables)
endif()

# otrp_generate_ca_tsm_key(PEM HEADER): the key that admits TSMs, as a C++ constant.
function(otrp_generate_ca_tsm_key pem header)
  get_filename_component(pem ${pem} ABSOLUTE BASE_DIR ${PROJECT_SOURCE_DIR})
  find_program(OPENSSL_PROGRAM openssl NO_CMAKE_FIND_ROOT_PATH REQUIRED)
  execute_process(COMMAND ${PROJECT_SOURCE_DIR}/kit/ca_tsm_key ${pem}
    OUTPUT_VARIABLE content ERROR_VARIABLE words RESULT_VARIABLE failed)
  if(failed)
    message(FATAL_ERROR "${words}")
  elseif(words AND NOT CMAKE_BUILD_TYPE STREQUAL "Debug")
    message(WARNING "${words}")
  endif()
  file(CONFIGURE OUTPUT ${header} CONTENT "${content}" @ONLY)
  set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${pem})
endfunction()

# otrp_describe(NAME UUID HEADER): what a TEE is told of a trusted application, from its
# ta_config.h, as JSON for the build scripts of kits.
function(otrp_describe name uuid header)
  file(STRINGS ${header} lines REGEX "^#define TA_[A-Z_]+ ")
  foreach(line ${lines})
    string(REGEX REPLACE "^#define (TA_[A-Z_]+) .*" "\\1" macro "${line}")
    string(REGEX REPLACE "^#define TA_[A-Z_]+ " "" value "${line}")
    if(value MATCHES "^0x[0-9a-f]+$")
      math(EXPR value "${value}")
    endif()
    set(${macro} "${value}")
  endforeach()

  set(flag_names)
  set(bit 1)
  foreach(flag
      USER_MODE EXEC_DDR SINGLE_INSTANCE MULTI_SESSION INSTANCE_KEEP_ALIVE SECURE_DATA_PATH)
    math(EXPR is_set "${TA_HEADER_FLAGS} & ${bit}")
    if(is_set)
      list(APPEND flag_names "\"${flag}\"")
    endif()
    math(EXPR bit "${bit} * 2")
  endforeach()
  list(JOIN flag_names ", " flag_names)
  configure_file(${PROJECT_SOURCE_DIR}/ta/description.json.in ${CMAKE_BINARY_DIR}/ta/${uuid}.json
    @ONLY)
endfunction()
