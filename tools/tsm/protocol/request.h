// SPDX-License-Identifier: BSD-2-Clause
/// Requests, from their plain members to the signed message.
///
/// make_request() runs the whole way. The steps before it are for who needs a request that differs
/// somewhere: take the JSON of one step, edit it, and go on with the next.
///
///     request_content() -> jwe_encrypt() -> tbs_request() -> seal()
#ifndef TSM_PROTOCOL_REQUEST_H
#define TSM_PROTOCOL_REQUEST_H

#include <optional>
#include <string>
#include <string_view>

#include "tsm/protocol/crypto.h"
#include "tsm/protocol/json.h"
#include "tsm/protocol/messages.h"
#include "tsm/protocol/parties.h"

namespace tsm {

/// What an operator says about a request; each message reads its own part of it.
struct RequestOptions {
  std::string rid;      // request ID; random when empty
  std::string tid;      // transaction ID; random when empty
  std::string dsihash;  // of the device's present state
  std::string spid;
  std::string sdname;
  std::string spcert;
  std::string did;  // the device ID when empty
  std::string taid;
  std::string ta_version;
  Bytes image;
  bool renew_aik = false;
  std::string deleteta;  // "true" or "false"
};

/// For "rid" and "tid": 16 hex digits.
std::string random_id();

/// Whether a message is made for one state of the device, whose hash it carries.
bool quotes_dsi(MessageId id);

/// The members of the encrypted "content"; null for the messages that have none.
Json request_content(MessageId id, const RequestOptions &options, std::string_view tsmid);

/// The name under which a message carries its encrypted image; empty when it carries none.
std::string_view image_member(MessageId id);

/// {"key", "iv", `image_name`}: the image under a fresh AES key, that key under the SP's AIK. `key`
/// has 32 bytes, of which the second half is used; `iv` has 16.
Json encrypted_ta(const RsaKey &aik, std::string_view image, std::string_view image_name,
                  const std::optional<Bytes> &key = {}, const std::optional<Bytes> &iv = {});

/// The to-be-signed request. Empty parts (null) are left out; `rid` and `tid` must be set.
Json tbs_request(const Message &message, const RequestOptions &options, Json key_chain,
                 Json encrypted_ta, Json content);

/// The signed message; `extra` members are added to the envelope behind its header. The payload is
/// the compact text of `tbs`, or exactly the given text.
std::string seal(const Json &tbs, std::string_view request_name, std::string_view tsmid,
                 const RsaKey &key, const Json &extra = Json::object());
std::string seal_text(std::string_view payload, std::string_view request_name,
                      std::string_view tsmid, const RsaKey &key,
                      const Json &extra = Json::object());

/// The one message that goes unsigned.
Json ta_info_request(std::string_view spid, std::string_view taid);

/// A good request of any kind. `dsi` is the device's last known state document, needed by the
/// messages with an image for the SP's AIK, NULL for others.
///
/// Throws tools::UsageError when the AIK or the CA's private half is missing, or a text is not
/// UTF-8.
std::string make_request(MessageId id, RequestOptions options, const Identity &tsm,
                         const DeviceInfo &device, const Json *dsi);

}  // namespace tsm

#endif
