// SPDX-License-Identifier: BSD-2-Clause
/// What only a TEE made for developers offers: a look into it from outside.
#ifndef DEVICE_INSPECT_H
#define DEVICE_INSPECT_H

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "device/device_client.h"

namespace device {

struct StoredObject {
  std::string id;
  size_t size;
};

struct Figure {
  const char *name;
  uint32_t value;
};

/// All functions look at the agent and throw an Error when they fail.
struct Inspection {
  std::string (*last_error)();                          // why the last call failed; may be empty
  std::vector<Figure> (*heap_figures)(Device &device);  // none when the agent is not running
  std::vector<StoredObject> (*list_objects)(Device &device);  // in ID order
  std::string (*get_object)(Device &device, std::string_view id);
  void (*put_object)(Device &device, std::string_view id, std::string_view data);
  void (*remove_object)(Device &device, std::string_view id);
  /// The trace of this thread's calls is added to `*lines`; NULL: it goes to standard error again.
  void (*collect_trace)(std::string *lines);
};

/// NULL where the TEE does not let anyone look.
const Inspection *inspection();

}  // namespace device

#endif
