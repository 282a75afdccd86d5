// SPDX-License-Identifier: BSD-2-Clause
/// The answers of a device, made without one: what the TSM reads in tests.
#ifndef TSM_FAKE_DEVICE_H
#define TSM_FAKE_DEVICE_H

#include <string>

#include "support/kept_key.h"
#include "tsm/protocol/jwe.h"
#include "tsm/protocol/messages.h"
#include "tsm/protocol/parties.h"

namespace tsm {

/// Making a key takes a while: one for each role, made once in a process.
enum Role { kTee, kAik, kCa, kStranger };
inline const RsaKey &key_of(Role role) {
  using otrp_test::kept_key;
  static const RsaKey keys[] = {kept_key("TEE"), kept_key("AIK"), kept_key("CA"),
                                kept_key("stranger")};
  return keys[role];
}

inline const Identity &test_tsm() {
  static const Identity tsm = admit("tsm1", otrp_test::kept_key("TSM"), key_of(kCa));
  return tsm;
}

inline DeviceInfo test_device() {
  return {"device-1", RsaKey::from_encoded(key_of(kTee).encoded()).value()};
}

/// A state with one SP, "sp", and its SD and TA.
inline Json test_dsi() {
  const Json sd = {{"name", "sd/1"}, {"spid", "sp"}, {"talist", {{{"taid", "ta"}}}}};
  const Json aik = {{"spaik", base64url_encode(key_of(kAik).encoded())}, {"spid", "sp"}};
  const Json tee = {{"sdlist", {{"cnt", 1}, {"sd", Json::array({sd})}}},
                    {"teeaiklist", Json::array({aik})}};
  return {{"dsi", {{"tee", tee}}}};
}

inline std::string sign_response(const Json &payload, const std::string &response_name,
                                 Role signer = kTee, const char *header = R"({"alg":"RS256"})") {
  const std::string protect = base64url_encode(header);
  const std::string payload_text = base64url_encode(payload.dump());
  const Bytes signature = rs256_sign(key_of(signer), protect + "." + payload_text);
  const Json envelope = {{"payload", payload_text},
                         {"signature", base64url_encode(signature)},
                         {"protect", protect},
                         {"header", {{"deviceId", "test_device_id"}}}};
  return Json{{response_name, envelope}}.dump();
}

inline std::string state_response(std::string_view dsi_text) {
  return sign_response({{"signerreq", "true"}, {"edsi", jwe_encrypt(test_tsm().key, dsi_text)}},
                       "GetDeviceTEEStateResponse");
}

inline std::string create_sd_response(const Json &members) {
  return sign_response({{"CreateSDTBSResponse", members}}, "CreateSDResponse");
}

inline Json refusal(const Json &code) {
  return {{"reason", {{"error_code", code}, {"error_message", ""}}}, {"status", "fail"}};
}

}  // namespace tsm

#endif
