// SPDX-License-Identifier: BSD-2-Clause
/// A device of the host TEE, and a TSM that manages it.
#ifndef SUPPORT_SCENE_H
#define SUPPORT_SCENE_H

#include "support/agent_device.h"
#include "support/manager.h"

namespace otrp_test {

class Scene : public Holds<AgentDevice>, public Manager {
 public:
  explicit Scene(const std::string &tsmid = "tsm1") : Manager(device, tsmid) {}
  /// A device with its objects in a state directory.
  Scene(const std::string &tsmid, const std::string &state_directory)
      : Holds<AgentDevice>{AgentDevice(state_directory)}, Manager(device, tsmid) {}
  /// A device that holds these objects.
  explicit Scene(const Snapshot &snapshot)
      : Holds<AgentDevice>{AgentDevice(snapshot)}, Manager(device) {}
  /// A device in the state of `other`, as its TSM knows it; no session is open yet.
  Scene(const Scene &other, const Snapshot &snapshot)
      : Holds<AgentDevice>{AgentDevice(snapshot)}, Manager(device, other) {}
};

}  // namespace otrp_test

#endif
