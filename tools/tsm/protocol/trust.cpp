// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/protocol/trust.h"

namespace tsm {
namespace {

constexpr size_t kRs256AlgorithmId = 0x70004830;  // GlobalPlatform's number of the algorithm

}  // namespace

std::string ca_tsm_hash(const RsaKey &ca) {
  return hex_encode(sha256(base64url_encode(ca.encoded())));
}

Bytes tsm_entry_block(size_t tsmid_len, size_t signature_len) {
  return little_endian(kRs256AlgorithmId, 4) + little_endian(3, 2) + little_endian(256, 2) +
         little_endian(tsmid_len, 2) + little_endian(signature_len, 2);
}

Json tsm_entry(const RsaKey &ca, std::string_view tsmid, std::string_view encoded_key) {
  const Bytes block = tsm_entry_block(tsmid.size(), ca.modulus_len());
  const Bytes signature = rs256_sign(ca, block + Bytes(tsmid) + Bytes(encoded_key));
  return {{"tsmid", tsmid},
          {"tsm_pub_key", base64url_encode(encoded_key)},
          {"signature", base64url_encode(signature)}};
}

Json key_chain(std::string_view ca_hash, const std::vector<Json> &entries) {
  return {{"ca_tsm_hash", ca_hash}, {"tsm_list", entries}};
}

std::string signature2(const RsaKey &ca, std::string_view tid, std::string_view rid,
                       std::string_view device_id, std::string_view taid, std::string_view tsmid) {
  return base64url_encode(rs256_sign(ca, {tid, rid, device_id, taid, tsmid}));
}

}  // namespace tsm
