// SPDX-License-Identifier: BSD-2-Clause
/// A device and a TSM that manages it: whole exchanges in one line.
#ifndef SUPPORT_SCENE_H
#define SUPPORT_SCENE_H

#include <functional>
#include <optional>
#include <string>

#include "support/agent_device.h"
#include "tsm/parties.h"
#include "tsm/request.h"
#include "tsm/response.h"

namespace otrp_test {

using tsm::Json;
using tsm::MessageId;

/// RSA keys are slow to make: one for each name, made once in a process.
const tsm::RsaKey &key_named(const std::string &name);

/// The key that the agent trusts by construction.
const tsm::RsaKey &dev_ca();

/// The TSM `tsmid`, admitted by the development CA.
const tsm::Identity &tsm_named(const std::string &tsmid);

/// What came of one exchange. The response was verified and decrypted.
struct Outcome {
  Reply reply;
  std::optional<tsm::Response> response;

  bool passed() const { return response && response->status == "pass"; }
  /// The code of a refused request: of its "reason", or the status word.
  uint32_t code() const;
};

/// Edits a request before it is sealed.
struct Edits {
  std::function<void(Json &content)> content = {};  // before it is encrypted
  std::function<void(Json &tbs)> tbs = {};          // before it is signed
  std::function<void(Json &extra)> extra = {};      // members beside the signature
};

/// A TA image with a header: `payload_len` bytes that depend on `seed`.
std::string make_image(size_t payload_len, uint32_t seed = 1);

/// A valid taid: 32 characters that begin with `name`.
std::string taid(const std::string &name);

class Scene {
 public:
  explicit Scene(const std::string &tsmid = "tsm1");
  /// A device with its objects in a state directory.
  Scene(const std::string &tsmid, const std::string &state_directory);
  /// A device in the state of `other`, as its TSM knows it; no session is open yet.
  Scene(const Scene &other, const Snapshot &snapshot);

  AgentDevice device;
  tsm::DeviceInfo info;

  /// The device state as the TSM knows it: its latest answer's.
  std::string dsi_text;
  Json dsi;
  std::string dsihash() const;

  const tsm::Identity &tsm() const { return *tsm_; }
  void use_tsm(const std::string &tsmid) { tsm_ = &tsm_named(tsmid); }

  /// The message text for the device's present state.
  std::string request(MessageId id, tsm::RequestOptions options, const Edits &edits = {}) const;

  /// One exchange: request, answer, and the new device state when the answer has it.
  Outcome run(MessageId id, const tsm::RequestOptions &options = {}, const Edits &edits = {});
  Outcome send(MessageId id, const std::string &text);

  // The usual requests.
  Outcome get_device_state();
  Outcome create_sd(const std::string &spid, const std::string &sdname);
  Outcome install_ta(const std::string &spid, const std::string &sdname, const std::string &taid,
                     const std::string &image = make_image(1000));
  Outcome update_ta(const std::string &spid, const std::string &sdname, const std::string &taid,
                    const std::string &image = make_image(1200, 2));
  Outcome delete_ta(const std::string &sdname, const std::string &taid);
  Outcome update_sd(const std::string &spid, const std::string &sdname, bool renew_aik = true);
  Outcome delete_sd(const std::string &sdname, const std::string &deleteta);
  Outcome get_ta_info(const std::string &spid, const std::string &taid);

  /// The names in the device state's SD list, in its order.
  std::vector<std::string> sd_names() const;

 private:
  const tsm::Identity *tsm_;
};

}  // namespace otrp_test

#endif
