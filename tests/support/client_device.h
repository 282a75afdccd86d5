// SPDX-License-Identifier: BSD-2-Clause
/// A device behind a TEE Client API, and nothing else of it.
#ifndef SUPPORT_CLIENT_DEVICE_H
#define SUPPORT_CLIENT_DEVICE_H

#include <optional>
#include <string>
#include <string_view>

#include "common/encoding.h"
#include "device/device_client.h"

namespace otrp_test {

/// What the agent answers with besides the codes of the TEE.
enum Code : uint32_t {
  kMismatch = 0xDEAD0001,
  kSdExists = 0xDEAD0002,
  kSdMismatch = 0xDEAD0004,
  kBadRequest = 0xDEAD0006,
  kNotDecrypted = 0xDEAD0007,
  kTaExists = 0xDEAD0008,
  kNotFound = 0xDEAD000A,
  kResponseFailed = 0xDEAD000E,
  kCaCheckFailed = 0xDEAD0010,
  kTaInfoIncomplete = 0xDEAD1001,
  kNoMemory = 0xDEAD1002,
  kMissing = 0xDEAD1004,
  kSpNotFound = 0xDEAD1005,
  kSetterFailed = 0xFFFFFFFF,
};

/// A little-endian word, as frames have them.
inline std::string word(uint32_t value) {
  return tools::little_endian(value, 4);
}
uint32_t word_at(std::string_view bytes, size_t offset);

/// The frame of command 0.
inline std::string frame(uint32_t message_id, std::string_view text) {
  return device::build_frame(message_id, text);
}

/// What one raw invocation left behind.
struct Answer {
  TEEC_Result result = 0;
  device::Origin origin = device::Origin::kClientApi;
  size_t size = 0;     // as the TA left it
  std::string buffer;  // all of the output buffer, 0xA5 where nothing was written
};

/// The output frame of command 0 taken apart.
struct Reply {
  TEEC_Result result = 0;
  uint32_t status = 0;
  std::string response;
  std::optional<std::string> image;
  Answer answer;
};

class ClientDevice {
 public:
  explicit ClientDevice(const std::string &context) : door_(context) {}

  device::Device &door() { return door_; }
  /// Of an open device.
  device::Session &session() { return *session_; }

  /// Opens the session if it is closed. False, with the code, when the instance is not created.
  bool open(TEEC_Result *result = nullptr);
  /// The same, but throws the device::Error that says why.
  void require_open();
  void close() { session_.reset(); }
  /// Ends the instance and starts a new one.
  bool restart();

  /// One command. Without an input the input buffer is NULL; both buffers have their exact size.
  Answer invoke(uint32_t command, std::optional<std::string_view> input, size_t capacity,
                uint16_t types = device::kMessageTypes);

  /// Command 0 with a well-formed frame around `text`.
  Reply send(uint32_t message_id, std::string_view text, size_t capacity = 1 << 20);

 private:
  device::Device door_;
  std::optional<device::Session> session_;
};

}  // namespace otrp_test

#endif
