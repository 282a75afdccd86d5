# SPDX-License-Identifier: BSD-2-Clause
# Part of the host TEE's kit for trusted applications.

# Flags of code that runs inside a TEE: no runtime library behind it, nor its headers. What the
# compiler knows of memcpy and the like it may go on using.
add_library(tee_ta_flags INTERFACE)
target_compile_options(tee_ta_flags INTERFACE
  -fvisibility=hidden
  -ffreestanding -fbuiltin
  $<$<COMPILE_LANGUAGE:CXX>:-nostdinc++ -fno-exceptions -fno-rtti -fno-threadsafe-statics>)

# tee_uuid_initializer(UUID VARIABLE): "c7acaae4-686e-..." as a TEE_UUID initializer.
function(tee_uuid_initializer uuid variable)
  if(NOT uuid MATCHES "^([0-9a-f]+)-([0-9a-f]+)-([0-9a-f]+)-([0-9a-f]+)-([0-9a-f]+)$")
    message(FATAL_ERROR "not a UUID in lower case: ${uuid}")
  endif()
  # Taken now: the next match clears the groups of this one.
  set(head "0x${CMAKE_MATCH_1}, 0x${CMAKE_MATCH_2}, 0x${CMAKE_MATCH_3}")
  string(REGEX MATCHALL ".." node "${CMAKE_MATCH_4}${CMAKE_MATCH_5}")
  list(TRANSFORM node PREPEND "0x")
  list(JOIN node ", " node)
  set(${variable} "{${head}, {${node}}}" PARENT_SCOPE)
endfunction()

# tee_add_ta_image(TARGET UUID): links the static library TARGET into the image ta/UUID.so, which
# the loader finds by its UUID. TARGET's include path must lead to its ta_config.h.
function(tee_add_ta_image target uuid)
  add_library(${target}_image MODULE ${PROJECT_SOURCE_DIR}/tee/image/ta_image.cpp)
  target_link_libraries(${target}_image PRIVATE
    tee_ta_flags otrp_warnings otrp_sanitizers
    "$<LINK_LIBRARY:WHOLE_ARCHIVE,${target}>" tee)
  set_target_properties(${target}_image PROPERTIES
    PREFIX "" OUTPUT_NAME ${uuid} LINKER_LANGUAGE C
    LIBRARY_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/ta)
  # Nothing of the C++ runtime library is used, so the image does not come to need it. An image is
  # loaded for each new instance: the fewer its segments, the sooner.
  target_link_options(${target}_image PRIVATE
    -Wl,--as-needed -Wl,--no-undefined -Wl,-Bsymbolic -Wl,-z,noseparate-code)
endfunction()
