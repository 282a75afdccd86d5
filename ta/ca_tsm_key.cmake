# SPDX-License-Identifier: BSD-2-Clause
# otrp_generate_ca_tsm_key(PEM HEADER): writes the modulus of a 2048-bit RSA key as a C++ constant.
function(otrp_generate_ca_tsm_key pem header)
  find_program(OPENSSL_PROGRAM openssl NO_CMAKE_FIND_ROOT_PATH REQUIRED)
  foreach(form "-pubin" "")
    execute_process(
      COMMAND ${OPENSSL_PROGRAM} rsa ${form} -in ${pem} -noout -text
      OUTPUT_VARIABLE text RESULT_VARIABLE failed ERROR_QUIET)
    if(NOT failed)
      execute_process(
        COMMAND ${OPENSSL_PROGRAM} rsa ${form} -in ${pem} -noout -modulus
        OUTPUT_VARIABLE modulus ERROR_QUIET OUTPUT_STRIP_TRAILING_WHITESPACE)
      break()
    endif()
  endforeach()
  string(REGEX REPLACE "^Modulus=" "" modulus "${modulus}")
  string(LENGTH "${modulus}" num_digits)
  if(failed OR NOT num_digits EQUAL 512 OR NOT text MATCHES "xponent: 65537 ")
    message(FATAL_ERROR
      "OTRP_CA_TSM_KEY must name a PEM file with a 2048-bit RSA key of exponent 65537: ${pem}")
  endif()

  file(SHA256 ${PROJECT_SOURCE_DIR}/keys/dev-ca-tsm.pub.pem public_digest)
  file(SHA256 ${PROJECT_SOURCE_DIR}/keys/dev-ca-tsm.pem private_digest)
  file(SHA256 ${pem} digest)
  if(CMAKE_BUILD_TYPE STREQUAL "Release" AND
      (digest STREQUAL public_digest OR digest STREQUAL private_digest))
    message(WARNING "The agent trusts the development CA-TSM key, whose private half is public. "
      "Set OTRP_CA_TSM_KEY for anything that leaves the desk.")
  endif()

  string(REGEX MATCHALL ".." bytes "${modulus}")
  list(TRANSFORM bytes PREPEND "0x")
  list(JOIN bytes ", " bytes)
  string(REPEAT "0x[0-9A-F][0-9A-F], " 8 row)
  string(REGEX REPLACE "(${row})" "\\1\n    " bytes "${bytes}")
  file(CONFIGURE OUTPUT ${header} CONTENT [[
/// Generated from OTRP_CA_TSM_KEY: the root from which TSM keys are admitted.
#ifndef CA_TSM_KEY_H
#define CA_TSM_KEY_H

#include <stdint.h>

// Big-endian, as TEE_ATTR_RSA_MODULUS expects; the public exponent is 65537.
constexpr uint8_t kCaTsmModulus[256] = {
    @bytes@};

#endif
]] @ONLY)
endfunction()
