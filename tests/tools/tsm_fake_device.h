// SPDX-License-Identifier: BSD-2-Clause
/// The answers of a device, made without one: what the TSM reads in tests.
#ifndef TSM_FAKE_DEVICE_H
#define TSM_FAKE_DEVICE_H

#include <string>

#include "tsm/jwe.h"
#include "tsm/messages.h"
#include "tsm/parties.h"

namespace tsm {

/// Key generation takes a while; tests that need any key share these.
inline const RsaKey &test_key(int index) {
  static const RsaKey keys[] = {RsaKey::generate(), RsaKey::generate(), RsaKey::generate(),
                                RsaKey::generate()};
  return keys[index];
}
inline const RsaKey &tee_key() {
  return test_key(0);
}
inline const RsaKey &aik_key() {
  return test_key(1);
}
inline const RsaKey &ca_key() {
  return test_key(2);
}
inline const RsaKey &stranger_key() {
  return test_key(3);
}

inline const Identity &test_tsm() {
  static const Identity tsm = make_identity("tsm1", ca_key());
  return tsm;
}

inline DeviceInfo test_device() {
  return {"device-1", RsaKey::from_encoded(tee_key().encoded()).value()};
}

/// A state with one SP, "sp", and its SD and TA.
inline Json test_dsi() {
  const Json sd = {{"name", "sd/1"}, {"spid", "sp"}, {"talist", {{{"taid", "ta"}}}}};
  const Json aik = {{"spaik", base64url_encode(aik_key().encoded())}, {"spid", "sp"}};
  return {{"dsi",
           {{"tee",
             {{"sdlist", {{"cnt", 1}, {"sd", Json::array({sd})}}},
              {"teeaiklist", Json::array({aik})}}}}}};
}

inline std::string sign_response(std::string_view payload, std::string_view response_name,
                                 const RsaKey &key = tee_key()) {
  const std::string protect = base64url_encode(R"({"alg":"RS256"})");
  const std::string payload_text = base64url_encode(payload);
  const Json envelope = {
      {"payload", payload_text},
      {"signature", base64url_encode(rs256_sign(key, protect + "." + payload_text))},
      {"protect", protect},
      {"header", {{"deviceId", "test_device_id"}}}};
  return Json{{std::string(response_name), envelope}}.dump();
}

inline std::string state_response(std::string_view dsi_text) {
  const Json payload = {{"ver", "1.0"},
                        {"rid", "r"},
                        {"tid", "t"},
                        {"signerreq", "true"},
                        {"edsi", jwe_encrypt(test_tsm().key, dsi_text)}};
  return sign_response(payload.dump(), "GetDeviceTEEStateResponse");
}

inline std::string create_sd_response(const Json &members) {
  return sign_response(Json{{"CreateSDTBSResponse", members}}.dump(), "CreateSDResponse");
}

}  // namespace tsm

#endif
