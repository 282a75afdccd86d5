// SPDX-License-Identifier: BSD-2-Clause
// The image of the test TA; see echo_ta.cpp.
#ifndef TA_CONFIG_H
#define TA_CONFIG_H

#define TA_UUID                    \
  {                                \
    0x00000000, 0x0000, 0x4000, {  \
      0x80, 0, 0, 0, 0, 0, 0, 0xEC \
    }                              \
  }
#define TA_STACK_SIZE 0x2000
#define TA_DATA_SIZE 0x10000
#define TA_HEADER_FLAGS 0
#define TA_SINGLE_INSTANCE true
#define TA_MULTI_SESSION true
#define TA_INSTANCE_KEEP_ALIVE false
#define TA_VERSION "1"
#define TA_DESCRIPTION "echo"
#define TA_TRACE_PREFIX "TA: echo"
#define TA_TRACE_LEVEL 2
#define TA_SIGNATURE_HEADER_MODE 1

#endif
