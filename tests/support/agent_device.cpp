// SPDX-License-Identifier: BSD-2-Clause
#include "support/agent_device.h"

#include <gtest/gtest.h>

#include <bit>

namespace otrp_test {

// The DSI's structure and its three texts.
static constexpr uint32_t kDsiBlocks = 4;

const TEE_UUID kAgentUuid = std::bit_cast<TEE_UUID>(device::kAgentUuid);
const TEE_UUID kCorvelUuid = std::bit_cast<TEE_UUID>(device::kKeyServiceUuid);

std::string stored(const std::string &payload) {
  return word(static_cast<uint32_t>(payload.size())) + payload;
}

std::string box_record(uint16_t type, const std::string &value) {
  return tools::little_endian(type, 2) + tools::little_endian(value.size(), 2) + value;
}

std::map<uint32_t, std::string> box_records(const std::string &box) {
  std::map<uint32_t, std::string> values;
  for (size_t at = 0, len = 0; at < box.size(); at += 4 + len) {
    len = word_at(box, at) >> 16;
    values[word_at(box, at) & 0xFFFF] = box.substr(at + 4, len);
  }
  return values;
}

FindsImages::FindsImages() {
  tee::test::set_ta_directory(OTRP_TEST_TA_DIR);
}

AgentDevice::AgentDevice(const Snapshot &snapshot) : AgentDevice() {
  for (const auto &[id, data] : snapshot.agent) put_object(kAgentUuid, id, data);
  for (const auto &[id, data] : snapshot.key_service) put_object(kCorvelUuid, id, data);
}

std::optional<std::string> payload_of(const std::string &raw) {
  if (raw.size() < 4) return std::nullopt;
  return raw.substr(4, word_at(raw, 0));
}

std::optional<std::string> AgentDevice::record(const std::string &id) const {
  const auto all = objects();
  const auto found = all.find(id);
  return found != all.end() ? payload_of(found->second) : std::nullopt;
}

void AgentDevice::put_record(const std::string &id, const std::string &payload) {
  put_object(kAgentUuid, id, stored(payload));
}

void AgentDevice::remove_record(const std::string &id) {
  remove_object(kAgentUuid, id);
}

tee_heap_stats AgentDevice::stats() {
  tee_heap_stats stats{};
  EXPECT_EQ(tee_inspect_stats(door().context(), &device::kAgentUuid, &stats), TEEC_SUCCESS);
  return stats;
}

void AgentDevice::expect_clean() {
  const tee_heap_stats now = stats();
  EXPECT_EQ(now.live_blocks, kDsiBlocks);
  EXPECT_EQ(now.open_objects, 0u);
  EXPECT_EQ(now.open_operations, 0u);
  EXPECT_EQ(now.open_sessions, 0u);
}

}  // namespace otrp_test
