// SPDX-License-Identifier: BSD-2-Clause
/// A device in memory that runs the agent linked into this program, and whatever must hold after
/// every command, checked.
#ifndef FUZZ_TARGET_DEVICE_H
#define FUZZ_TARGET_DEVICE_H

#include <tee_test.h>

#include <optional>

#include "support/client_device.h"
#include "support/require.h"
#include "support/stored_device.h"

namespace fuzz {

constexpr uint32_t kMessageCommand = 0;
constexpr uint32_t kQueryCommand = 1;

/// A frame's first word means nothing to the agent. Here it is the capacity of the output buffer,
/// up to kMaxCapacity; 0, which clients send, stands for that.
constexpr uint32_t kMaxCapacity = 1 << 14;
uint32_t capacity_of(std::string_view frame);

class TargetDevice : tee::test::Device, public otrp_test::ClientDevice {
 public:
  /// With the objects of `stored`, or none.
  explicit TargetDevice(const StoredDevice &stored);
  TargetDevice();

  /// False when the instance cannot be created.
  bool open();

  /// A command to the open instance. Ends the process unless the answer is well-formed, the rest
  /// of the output buffer untouched, and nothing left on the heap or open but the state document.
  device::Reply run(uint32_t command, std::string_view input, uint32_t capacity = kMaxCapacity);

  /// Replaces the agent's objects by `objects`; the device must be closed.
  void store(const Objects &objects);

  /// Gives an open device the objects and the instance back that it began with, if any have
  /// changed. The agent must be able to start with what is stored then.
  void restore();

  Objects agent_objects() const;
  Objects key_service_objects() const;

 private:
  void require_clean();
  void require_clean_failure();
  void require_message_answer(const device::Reply &reply);

  tee::test::TraceSink log_;
  Objects first_;
  std::string first_state_;
  uint64_t writes_ = 0;
  std::optional<tsm::RsaKey> tee_key_;
};

}  // namespace fuzz

#endif
