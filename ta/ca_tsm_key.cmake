# SPDX-License-Identifier: BSD-2-Clause
# otrp_read_modulus(PEM VARIABLE): the modulus of a 2048-bit RSA key, public or private, in
# hexadecimal digits; empty when it is none of exponent 65537.
function(otrp_read_modulus pem variable)
  find_program(OPENSSL_PROGRAM openssl NO_CMAKE_FIND_ROOT_PATH REQUIRED)
  set(${variable} "" PARENT_SCOPE)
  foreach(form "-pubin" "")
    execute_process(
      COMMAND ${OPENSSL_PROGRAM} rsa ${form} -in ${pem} -noout -text -modulus
      OUTPUT_VARIABLE text RESULT_VARIABLE failed ERROR_QUIET)
    if(NOT failed AND text MATCHES "xponent: 65537 " AND text MATCHES "Modulus=([0-9A-F]+)")
      string(LENGTH "${CMAKE_MATCH_1}" num_digits)
      if(num_digits EQUAL 512)
        set(${variable} "${CMAKE_MATCH_1}" PARENT_SCOPE)
      endif()
      return()
    endif()
  endforeach()
endfunction()

# otrp_generate_ca_tsm_key(PEM HEADER): writes the modulus of that key as a C++ constant.
function(otrp_generate_ca_tsm_key pem header)
  # A key that is replaced in place is another key.
  set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${pem})
  otrp_read_modulus(${pem} modulus)
  if(NOT modulus)
    message(FATAL_ERROR
      "OTRP_CA_TSM_KEY must name a PEM file with a 2048-bit RSA key of exponent 65537: ${pem}")
  endif()
  otrp_read_modulus(${PROJECT_SOURCE_DIR}/keys/dev-ca-tsm.pub.pem development)
  if(modulus STREQUAL development AND NOT CMAKE_BUILD_TYPE STREQUAL "Debug")
    message(WARNING "The agent trusts the development CA-TSM key, whose private half is public. "
      "Set OTRP_CA_TSM_KEY for anything that leaves the desk.")
  endif()

  string(REGEX MATCHALL ".." bytes "${modulus}")
  list(TRANSFORM bytes PREPEND "0x")
  list(JOIN bytes ", " bytes)
  string(REPEAT "0x[0-9A-F][0-9A-F], " 8 row)
  string(REGEX REPLACE "(${row})" "\\1\n    " bytes "${bytes}")
  file(CONFIGURE OUTPUT ${header} CONTENT [[
/// Generated from OTRP_CA_TSM_KEY: whose signature admits TSMs.
#ifndef CA_TSM_KEY_H
#define CA_TSM_KEY_H

#include <stdint.h>

// Big-endian, as TEE_ATTR_RSA_MODULUS expects; the public exponent is 65537.
constexpr uint8_t kCaTsmModulus[256] = {
    @bytes@};

#endif
]] @ONLY)
endfunction()
