// SPDX-License-Identifier: BSD-2-Clause
// What the agent finds stored when it starts: the input's objects beside, or in place of, those of
// the stored device. If it starts with them, it must answer all that reads or changes them.
#include "support/record_list.h"
#include "support/require.h"
#include "support/sealed_request.h"
#include "support/target_device.h"

namespace {

using tsm::MessageId;

constexpr size_t kMaxIdLen = 64;
const char kTaid[] = "77a11e7a000000000000000000000001";

std::string frame_around(MessageId id, const std::string &content) {
  return device::build_frame(static_cast<uint32_t>(id), fuzz::request_around(id, content, ""));
}

// Made once: the objects differ from run to run, the requests need not.
const std::vector<std::string> &frames() {
  static const std::vector<std::string> frames = {
      frame_around(MessageId::kGetTaInfo, tsm::ta_info_request("bank", kTaid).dump()),
      frame_around(MessageId::kDeleteTa,
                   tsm::Json{{"tsmid", "tsm1"}, {"sdname", "wallet"}, {"taid", kTaid}}.dump()),
      frame_around(MessageId::kDeleteSd,
                   tsm::Json{{"tsmid", "tsm1"}, {"sdname", "cards"}, {"deleteta", "true"}}.dump()),
      frame_around(MessageId::kGetDeviceState, fuzz::stored_device().tsm.key_chain.dump()),
  };
  return frames;
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  const fuzz::StoredDevice &stored = fuzz::stored_device();
  static fuzz::TargetDevice device(stored.agent, stored.key_service);
  fuzz::Objects objects = stored.agent;
  for (const fuzz::StoredRecord &record : fuzz::parse_records(fuzz::as_view(data, size))) {
    if (record.id.size() <= kMaxIdLen) objects[record.id] = record.data;
  }
  device.close();
  device.store(objects);
  if (!device.open()) return 0;
  for (const std::string &frame : frames()) device.run(fuzz::kMessageCommand, frame);
  device.run(fuzz::kQueryCommand, device::build_query(kTaid));
  return 0;
}
