// SPDX-License-Identifier: BSD-2-Clause
/// The table of messages: who verifies, processes and encodes each.
#ifndef MESSAGE_TABLE_H
#define MESSAGE_TABLE_H

#include <stdint.h>

#include "message.h"

struct message_entry {
  uint32_t id;
  const char *request_template;  // the shape of the request, for readers of the table
  const char *request_name;      // outer key of the envelope
  verify_function verify;
  process_function process;
  encode_function encode;
};

/// The entry of a message ID, or NULL.
const message_entry *find_message(uint32_t id);

#endif
