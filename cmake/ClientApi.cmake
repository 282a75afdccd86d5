# SPDX-License-Identifier: BSD-2-Clause
# The TEE Client API that otrp-device and port_test are built for: the host TEE's, or any other. With
# another one nothing is built but what lives in the normal world.
set(OTRP_TEEC "" CACHE FILEPATH "Library with a TEE Client API (empty: the host TEE's)")
set(OTRP_TEEC_INCLUDE "" CACHE PATH "Folder with the tee_client_api.h of OTRP_TEEC")

add_library(otrp_teec INTERFACE)
if(NOT OTRP_TEEC)
  target_link_libraries(otrp_teec INTERFACE tee)
elseif(NOT EXISTS ${OTRP_TEEC})
  message(FATAL_ERROR "OTRP_TEEC must name a library with a TEE Client API: ${OTRP_TEEC}")
elseif(NOT EXISTS "${OTRP_TEEC_INCLUDE}/tee_client_api.h")
  message(FATAL_ERROR "OTRP_TEEC_INCLUDE must name the folder of the tee_client_api.h that goes with "
    "${OTRP_TEEC}: \"${OTRP_TEEC_INCLUDE}\"")
else()
  target_link_libraries(otrp_teec INTERFACE ${OTRP_TEEC})
  target_include_directories(otrp_teec SYSTEM INTERFACE ${OTRP_TEEC_INCLUDE})
endif()
