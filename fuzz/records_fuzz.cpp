// SPDX-License-Identifier: BSD-2-Clause
// What the agent finds stored when it starts: the input's objects beside, or in place of, those of
// the stored device. If it starts with them, it must answer all that reads or changes them.
#include "support/sealed_request.h"
#include "support/target_device.h"

namespace fuzz {

using tsm::Json;
using tsm::MessageId;

constexpr size_t kMaxIdLen = 64;
const char kTaid[] = "77a11e7a000000000000000000000001";

// Made once: the objects differ from run to run, the requests need not.
static const std::vector<std::string> &frames() {
  static const std::vector<std::string> frames = {
      frame_around(MessageId::kGetTaInfo, tsm::ta_info_request("bank", kTaid).dump()),
      frame_around(MessageId::kDeleteTa,
                   Json{{"tsmid", "tsm1"}, {"sdname", "wallet"}, {"taid", kTaid}}.dump()),
      frame_around(MessageId::kDeleteSd,
                   Json{{"tsmid", "tsm1"}, {"sdname", "cards"}, {"deleteta", "true"}}.dump()),
      frame_around(MessageId::kGetDeviceState, stored_device().tsm.key_chain.dump()),
  };
  return frames;
}

void check(std::string_view input) {
  static TargetDevice device(stored_device());
  Objects objects = parse_objects(input);
  objects.insert(stored_device().agent.begin(), stored_device().agent.end());
  std::erase_if(objects, [](const auto &object) { return object.first.size() > kMaxIdLen; });
  device.close();
  device.store(objects);
  if (!device.open()) return;
  for (const std::string &frame : frames()) device.run(kMessageCommand, frame);
  device.run(kQueryCommand, device::build_query(kTaid));
}

}  // namespace fuzz
