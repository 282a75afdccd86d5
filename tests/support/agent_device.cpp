// SPDX-License-Identifier: BSD-2-Clause
#include "support/agent_device.h"

#include <gtest/gtest.h>

#include <cstring>
#include <memory>

namespace otrp_test {

namespace {

// The DSI's structure and its three texts.
constexpr uint32_t kDsiBlocks = 4;

uint32_t word_at(std::string_view bytes, size_t offset) {
  uint32_t value = 0;
  for (size_t i = 0; i < 4; ++i) {
    value |= uint32_t{static_cast<uint8_t>(bytes.at(offset + i))} << (8 * i);
  }
  return value;
}

TEE_UUID as_tee_uuid(const TEEC_UUID &uuid) {
  TEE_UUID same{};
  static_assert(sizeof same == sizeof uuid);
  std::memcpy(&same, &uuid, sizeof same);
  return same;
}

}  // namespace

const TEE_UUID kAgentUuid = as_tee_uuid(device::kAgentUuid);
const TEE_UUID kCorvelUuid = as_tee_uuid(device::kKeyServiceUuid);

std::string word(uint32_t value) {
  std::string bytes(4, 0);
  for (size_t i = 0; i < 4; ++i) bytes[i] = static_cast<char>(value >> (8 * i));
  return bytes;
}

std::string frame(uint32_t message_id, std::string_view text) {
  const std::string block = "tests";
  const std::string len = word(static_cast<uint32_t>(block.size()));
  return word(0) + len + block + len + block + word(message_id) +
         word(static_cast<uint32_t>(text.size())) + std::string(text);
}

HostDevice::HostDevice() {
  tee::test::set_ta_directory(OTRP_TEST_TA_DIR);
}

AgentDevice::AgentDevice(const Snapshot &snapshot) {
  for (const auto &[id, data] : snapshot.agent) host_.put_object(kAgentUuid, id, data);
  for (const auto &[id, data] : snapshot.key_service) host_.put_object(kCorvelUuid, id, data);
}

HostDevice::HostDevice(const std::string &state_directory) : Device(state_directory) {
  tee::test::set_ta_directory(OTRP_TEST_TA_DIR);
}

bool AgentDevice::open(TEEC_Result *result) {
  if (is_open_) return true;
  uint32_t origin = 0;
  const TEEC_Result opened = TEEC_OpenSession(door_.context(), &session_, &device::kAgentUuid,
                                              TEEC_LOGIN_PUBLIC, nullptr, nullptr, &origin);
  if (result != nullptr) *result = opened;
  is_open_ = opened == TEEC_SUCCESS;
  return is_open_;
}

void AgentDevice::close() {
  if (is_open_) TEEC_CloseSession(&session_);
  is_open_ = false;
}

bool AgentDevice::restart() {
  close();
  return open();
}

Answer AgentDevice::invoke(uint32_t command, std::optional<std::string_view> input, size_t capacity,
                           uint32_t types) {
  // Exactly sized, so that the sanitizer sees one byte too far.
  std::unique_ptr<char[]> in;
  if (input) {
    in = std::make_unique<char[]>(input->size());
    std::memcpy(in.get(), input->data(), input->size());
  }
  auto out = capacity != 0 ? std::make_unique<char[]>(capacity) : nullptr;
  if (out) std::memset(out.get(), 0xA5, capacity);

  TEEC_Operation operation{};
  operation.paramTypes = types;
  operation.params[0].tmpref = {in.get(), input ? input->size() : 0};
  operation.params[1].tmpref = {out.get(), capacity};
  uint32_t origin = 0;
  Answer answer;
  answer.result = TEEC_InvokeCommand(&session_, command, &operation, &origin);
  answer.size = operation.params[1].tmpref.size;
  if (out) answer.buffer.assign(out.get(), capacity);
  return answer;
}

Reply AgentDevice::send(uint32_t message_id, std::string_view text, size_t capacity) {
  Reply reply;
  reply.answer = invoke(0, frame(message_id, text), capacity);
  reply.result = reply.answer.result;
  const std::string &buffer = reply.answer.buffer;
  if (buffer.size() < 8) return reply;
  reply.status = word_at(buffer, 0);
  if (reply.result != TEEC_SUCCESS) return reply;
  const size_t response_len = word_at(buffer, 4);
  reply.response = buffer.substr(8, response_len);
  const size_t image_offset = 8 + response_len;
  if (reply.answer.size > image_offset && reply.answer.size <= capacity) {
    reply.image = buffer.substr(image_offset + 4, word_at(buffer, image_offset));
  }
  return reply;
}

std::optional<std::string> AgentDevice::record(const std::string &id) const {
  const auto all = objects();
  const auto found = all.find(id);
  if (found == all.end() || found->second.size() < 4) return std::nullopt;
  return found->second.substr(4, word_at(found->second, 0));
}

void AgentDevice::put_record(const std::string &id, std::string_view payload) {
  host_.put_object(kAgentUuid, id,
                   word(static_cast<uint32_t>(payload.size())) + std::string(payload));
}

tee_heap_stats AgentDevice::stats() {
  tee_heap_stats stats{};
  EXPECT_EQ(tee_inspect_stats(door_.context(), &device::kAgentUuid, &stats), TEEC_SUCCESS);
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
