// SPDX-License-Identifier: BSD-2-Clause
/// A device of the host TEE that runs the real TA images, in memory or in a state directory: faults
/// can be ordered, and what it stores be seen.
#ifndef SUPPORT_AGENT_DEVICE_H
#define SUPPORT_AGENT_DEVICE_H

#include <tee_inspect.h>
#include <tee_test.h>

#include <map>

#include "support/client_device.h"

namespace otrp_test {

extern const TEE_UUID kAgentUuid;
extern const TEE_UUID kCorvelUuid;

/// A raw data stream: the payload behind its length.
std::string stored(const std::string &payload);

/// The payload of a stored object: what follows its length prefix, as long as that says.
std::optional<std::string> payload_of(const std::string &raw);

/// A record of the boxes that keys are kept in.
std::string box_record(uint16_t type, const std::string &value);

/// The records of a box, values by type.
std::map<uint32_t, std::string> box_records(const std::string &box);

/// The TA images are those of this build.
struct FindsImages {
  FindsImages();
};

/// What a device keeps: the objects of the agent and of the key service.
struct Snapshot {
  std::map<std::string, std::string> agent;
  std::map<std::string, std::string> key_service;
};

class AgentDevice : FindsImages, tee::test::Device, public ClientDevice {
 public:
  AgentDevice() : ClientDevice(name()) {}
  explicit AgentDevice(const Snapshot &snapshot);
  /// With its objects on disk.
  explicit AgentDevice(const std::string &state_directory)
      : Device(state_directory), ClientDevice(name()) {}

  tee::test::Device &host() { return *this; }

  /// The payload of a stored object, if there is one.
  std::optional<std::string> record(const std::string &id) const;
  void put_record(const std::string &id, const std::string &payload);
  void remove_record(const std::string &id);
  std::map<std::string, std::string> objects() const { return Device::objects(kAgentUuid); }
  Snapshot snapshot() const { return {objects(), Device::objects(kCorvelUuid)}; }

  tee_heap_stats stats();

  /// Fails the test unless only the DSI's blocks are on the heap and nothing is open.
  void expect_clean();
};

}  // namespace otrp_test

#endif
