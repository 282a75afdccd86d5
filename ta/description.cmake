# SPDX-License-Identifier: BSD-2-Clause
# otrp_describe_agent(HEADER JSON): what a TEE is told of the agent, from its ta_config.h, as JSON
# for the build scripts of kits.
function(otrp_describe_agent header json)
  file(STRINGS ${header} lines REGEX "^#define TA_[A-Z_]+ ")
  foreach(line ${lines})
    string(REGEX REPLACE "^#define (TA_[A-Z_]+) .*" "\\1" name "${line}")
    string(REGEX REPLACE "^#define TA_[A-Z_]+ " "" value "${line}")
    if(value MATCHES "^0x[0-9a-f]+$")
      math(EXPR value "${value}")
    endif()
    set(${name} "${value}")
  endforeach()
  configure_file(${CMAKE_CURRENT_FUNCTION_LIST_DIR}/description.json.in ${json} @ONLY)
endfunction()
