// SPDX-License-Identifier: BSD-2-Clause
/// A TSM that manages a device: whole exchanges in one line.
#ifndef SUPPORT_MANAGER_H
#define SUPPORT_MANAGER_H

#include <gtest/gtest.h>

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "support/client_device.h"
#include "tsm/protocol/parties.h"
#include "tsm/protocol/request.h"
#include "tsm/protocol/response.h"

namespace otrp_test {

using tsm::Json;
using tsm::MessageId;

/// The value of an environment variable, where it is set.
std::string environment(const char *name, const std::string &otherwise);

/// RSA keys are slow to make: one for each name, made once in a process.
const tsm::RsaKey &key_named(const std::string &name);

/// The key that the agent trusts by construction: OTRP_TEST_CA, or the development CA's.
const tsm::RsaKey &dev_ca();

/// The TSM `tsmid`, admitted by that CA.
const tsm::Identity &tsm_named(const std::string &tsmid);

/// What came of one exchange. The response was verified and decrypted.
struct Outcome {
  std::string_view message;  // its name on command lines
  Reply reply;
  std::optional<tsm::Response> response;

  /// Two messages have no status: theirs is a response without one, or none. A test that expected
  /// the other says what the device answered.
  testing::AssertionResult passed() const;
  /// The code of a refused request: of its "reason", or the status word.
  uint32_t code() const;
};

using Edit = std::function<void(Json &members)>;

/// Sets members and, by null, removes them (RFC 7396).
Edit patch(const Json &changes);

/// Changes to a request on its way to the device.
struct Edits {
  Edit content = {};   // before it is encrypted
  Edit tbs = {};       // before it is signed
  Edit envelope = {};  // afterwards
  tsm::ContentCipher cipher = tsm::ContentCipher::kA128CbcHs256;
};

/// A TA image with a header: `payload_len` bytes that depend on `seed`.
std::string make_image(size_t payload_len, uint32_t seed = 1);

/// A valid taid: 32 characters that begin with `name`.
std::string taid(const std::string &name);

/// A request that a furnished device carries out.
tsm::RequestOptions usual(MessageId id);

class Manager {
 public:
  explicit Manager(ClientDevice &device, const std::string &tsmid = "tsm1")
      : Manager(device, tsm_named(tsmid)) {}
  /// `tsm` must live longer.
  Manager(ClientDevice &device, const tsm::Identity &tsm);
  /// Of a device in the state that `other` knows of its own.
  Manager(ClientDevice &device, const Manager &other);

  tsm::DeviceInfo info;

  /// Bytes of the buffer for an answer: enough for a few SDs. A long request gets more.
  size_t capacity = 1 << 15;

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

  /// Makes sd1 with ta1 and ta2, and sd2, for sp1; and sd3 for sp2.
  void furnish();

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

  /// The lists of the device state, and the names in that of the SDs, in its order.
  const Json &sd_list() const { return dsi.at("dsi").at("tee").at("sdlist").at("sd"); }
  const Json &aik_list() const { return dsi.at("dsi").at("tee").at("teeaiklist"); }
  std::vector<std::string> sd_names() const;

 private:
  ClientDevice &device_;
  const tsm::Identity *tsm_;
};

/// The device of a scene, which is there before its manager.
template <class Device>
struct Holds {
  Device device;
};

}  // namespace otrp_test

#endif
