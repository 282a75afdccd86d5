// SPDX-License-Identifier: BSD-2-Clause
/// The inner parts of requests: contents, key chains, encrypted images and what the CA-TSM signs.
#ifndef TSM_INSPECT_CONTENT_H
#define TSM_INSPECT_CONTENT_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tsm/inspect/keys.h"
#include "tsm/protocol/messages.h"
#include "tsm/protocol/request.h"
#include "tsm/protocol/trust.h"

namespace tsm {

/// Reports what the device reads of a decrypted content, and returns it.
std::optional<Json> inspect_content(MessageId id, std::string_view plain, Report *report);

void inspect_key_chain(const Json &chain, const std::string &tsmid, const AtHand &at_hand,
                       Report *report);

/// The key that `chain` brings for `tsmid`, if there is one.
void add_chain_key(const Json &chain, const std::string &tsmid, std::vector<KeyAtHand> *keys);

void inspect_encrypted_ta(MessageId id, const Json &encrypted_ta, const AtHand &at_hand,
                          Report *report);

void inspect_image(std::string_view image, Report *report);

/// `taid` is NULL when the content was not opened.
void inspect_signature2(const Json &envelope, const Json &members, const std::string *taid,
                        const std::string &tsmid, const AtHand &at_hand, Report *report);

/// An encoded public key as its size and fingerprint, any other text as it is.
std::string key_or_text(const std::string &text);

}  // namespace tsm

#endif
