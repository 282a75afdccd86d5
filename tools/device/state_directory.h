// SPDX-License-Identifier: BSD-2-Clause
/// Devices in directories, which are made when they are opened: a name that was mistyped makes one.
#ifndef DEVICE_STATE_DIRECTORY_H
#define DEVICE_STATE_DIRECTORY_H

#include <string>

#include "device/device_client.h"

namespace device {

/// Opens a device; a line on standard error says that one was made, and where. With `must_exist`
/// that is refused with a tools::UsageError.
class StateDevice : public Device {
 public:
  StateDevice(const std::string &directory, bool must_exist);

 private:
  enum class Making { kNo, kYes };
  StateDevice(const std::string &directory, Making making);
};

}  // namespace device

#endif
