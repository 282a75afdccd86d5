// SPDX-License-Identifier: BSD-2-Clause
/// The exchanges in docs/examples: what a TSM asks of a new device, one file each.
#ifndef E2E_EXAMPLES_H
#define E2E_EXAMPLES_H

#include "support/scene.h"

namespace otrp_test {

struct Step {
  MessageId id;
  tsm::RequestOptions options;
};

inline const std::string kTa = taid("pay");

inline tsm::RequestOptions bring_ta(const char *version, const std::string &image) {
  return {.spid = "bank", .sdname = "wallet", .taid = kTa, .ta_version = version, .image = image};
}

inline const Step kSteps[] = {
    {MessageId::kGetDeviceState, {}},
    {MessageId::kCreateSd, {.spid = "bank", .sdname = "wallet", .spcert = "certificate"}},
    {MessageId::kInstallTa, bring_ta("1.0", make_image(64))},
    {MessageId::kUpdateTa, bring_ta("1.1", make_image(64, 2))},
    {MessageId::kGetTaInfo, {.spid = "bank", .taid = kTa}},
    {MessageId::kUpdateSd,
     {.spid = "bank", .sdname = "wallet", .spcert = "new certificate", .renew_aik = true}},
    {MessageId::kDeleteTa, {.sdname = "wallet", .taid = kTa}},
    {MessageId::kDeleteSd, {.sdname = "wallet", .deleteta = "true"}},
};

inline std::string file_of(const std::string &folder, MessageId id) {
  return folder + "/" + std::string(tsm::message_of(id).command) + ".json";
}

}  // namespace otrp_test

#endif
