// SPDX-License-Identifier: BSD-2-Clause
#include "support/client_device.h"

namespace otrp_test {

uint32_t word_at(std::string_view bytes, size_t offset) {
  uint32_t value = 0;
  for (size_t i = 0; i < 4; ++i) {
    value |= uint32_t{static_cast<uint8_t>(bytes.at(offset + i))} << (8 * i);
  }
  return value;
}

void ClientDevice::require_open() {
  if (!session_) session_.emplace(door_, device::kAgentUuid);
}

bool ClientDevice::open(TEEC_Result *result) {
  try {
    require_open();
  } catch (const device::Error &error) {
    session_.reset();
    if (result != nullptr) *result = error.code();
  }
  return session_.has_value();
}

bool ClientDevice::restart() {
  close();
  return open();
}

Answer ClientDevice::invoke(uint32_t command, std::optional<std::string_view> input,
                            size_t capacity, uint16_t types) {
  const device::Reply reply =
      session_->invoke({.command_id = command,
                        .input = input ? device::Buffer(*input) : device::Buffer(),
                        .capacity = static_cast<uint32_t>(capacity),
                        .types = types});
  return {reply.result, reply.origin, reply.size, std::string(reply.output.bytes())};
}

Reply ClientDevice::send(uint32_t message_id, std::string_view text, size_t capacity) {
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

}  // namespace otrp_test
