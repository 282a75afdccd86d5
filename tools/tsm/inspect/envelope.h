// SPDX-License-Identifier: BSD-2-Clause
/// The signed envelope of a request or an answer.
#ifndef TSM_INSPECT_ENVELOPE_H
#define TSM_INSPECT_ENVELOPE_H

#include <optional>
#include <string>
#include <string_view>

#include "tsm/inspect/keys.h"
#include "tsm/protocol/crypto.h"
#include "tsm/protocol/json.h"

namespace tsm {

/// An envelope's parts. What is not there, or not readable, is empty.
struct Signed {
  std::string sender;
  std::string input;  // what is signed
  std::optional<Bytes> signature;
  std::optional<Json> payload;

  bool is_by(const RsaKey &key) const { return signature && rs256_verify(key, input, *signature); }
};

/// Reports what is in the envelope but the signature's check. `sender` is the member of its header.
Signed read_signed(const Json &envelope, std::string_view sender, Report *report);

/// Reports whether a key signed; see report_search().
void report_signature(const KeySearch &search, std::string_view needed, Report *report);

/// The payload's members, below `outer_name` where there is one; NULL when it cannot be read.
const Json *members_of(const Signed &parts, std::string_view outer_name, Report *report);

}  // namespace tsm

#endif
