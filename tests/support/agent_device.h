// SPDX-License-Identifier: BSD-2-Clause
/// A device in memory that runs the real TA images, driven through the Client API.
#ifndef SUPPORT_AGENT_DEVICE_H
#define SUPPORT_AGENT_DEVICE_H

#include <tee_inspect.h>
#include <tee_test.h>

#include <map>
#include <optional>
#include <string>
#include <string_view>

#include "device/device_client.h"

namespace otrp_test {

extern const TEE_UUID kAgentUuid;
extern const TEE_UUID kCorvelUuid;

/// A little-endian word, as frames have them.
std::string word(uint32_t value);

/// What one raw invocation left behind.
struct Answer {
  TEEC_Result result = 0;
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

/// Finds the TA images of this build.
struct HostDevice : tee::test::Device {
  HostDevice();
  explicit HostDevice(const std::string &state_directory);
};

/// What a device keeps: the objects of the agent and of the key service.
struct Snapshot {
  std::map<std::string, std::string> agent;
  std::map<std::string, std::string> key_service;
};

class AgentDevice {
 public:
  AgentDevice() = default;
  explicit AgentDevice(const Snapshot &snapshot);
  /// With its objects on disk.
  explicit AgentDevice(const std::string &state_directory) : host_(state_directory) {}
  ~AgentDevice() { close(); }
  AgentDevice(const AgentDevice &) = delete;
  AgentDevice &operator=(const AgentDevice &) = delete;

  tee::test::Device &host() { return host_; }
  device::Device &door() { return door_; }

  /// Opens the session if it is closed. False, with the code, when the instance is not created.
  bool open(TEEC_Result *result = nullptr);
  void close();
  /// Ends the instance and starts a new one.
  bool restart();

  /// One command. Without an input the input buffer is NULL; both buffers have their exact size.
  Answer invoke(uint32_t command, std::optional<std::string_view> input, size_t capacity,
                uint32_t types = 0x65);

  /// Command 0 with a well-formed frame around `text`.
  Reply send(uint32_t message_id, std::string_view text, size_t capacity = 1 << 20);

  /// The payload of a stored object: what follows its length prefix, as long as that says.
  std::optional<std::string> record(const std::string &id) const;
  void put_record(const std::string &id, std::string_view payload);
  std::map<std::string, std::string> objects() const { return host_.objects(kAgentUuid); }
  Snapshot snapshot() const { return {objects(), host_.objects(kCorvelUuid)}; }

  tee_heap_stats stats();

  /// Fails the test unless only the DSI's blocks are on the heap and nothing is open.
  void expect_clean();

 private:
  HostDevice host_;
  device::Device door_{host_.name()};
  TEEC_Session session_{};
  bool is_open_ = false;
};

/// The frame of command 0.
std::string frame(uint32_t message_id, std::string_view text);

}  // namespace otrp_test

#endif
