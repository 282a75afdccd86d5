// SPDX-License-Identifier: BSD-2-Clause
/// What the CA-TSM key signs: the key chain entry that admits a TSM to devices, and the second
/// signature of requests that bring a TA image.
#ifndef TSM_PROTOCOL_TRUST_H
#define TSM_PROTOCOL_TRUST_H

#include <string>
#include <string_view>
#include <vector>

#include "tsm/protocol/crypto.h"
#include "tsm/protocol/json.h"

namespace tsm {

/// Names the CA-TSM key in a key chain: 64 lower-case hex digits.
std::string ca_tsm_hash(const RsaKey &ca);

/// What the CA signs ahead of the tsmid and the encoded public key; little-endian:
///
///     | algorithm, 0x70004830 (4) | 3 (2) | 256 (2) | tsmid length (2) | signature length (2) |
Bytes tsm_entry_block(size_t tsmid_len, size_t signature_len);

/// {"tsmid", "tsm_pub_key", "signature"}; `encoded_key` is signed whatever it holds.
Json tsm_entry(const RsaKey &ca, std::string_view tsmid, std::string_view encoded_key);

/// {"ca_tsm_hash", "tsm_list"}
Json key_chain(std::string_view ca_hash, const std::vector<Json> &entries);

/// base64url of the CA's signature; `tid` and `rid` as they stand in the request's text.
std::string signature2(const RsaKey &ca, std::string_view tid, std::string_view rid,
                       std::string_view device_id, std::string_view taid, std::string_view tsmid);

}  // namespace tsm

#endif
