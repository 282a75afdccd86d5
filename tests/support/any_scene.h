// SPDX-License-Identifier: BSD-2-Clause
/// For the cases that need nothing but the Client API: the device that OTRP_TEST_CONTEXT names, or
/// else a new one of the host TEE. It must have no security domains.
#ifndef SUPPORT_ANY_SCENE_H
#define SUPPORT_ANY_SCENE_H

#include <gtest/gtest.h>

#include "support/manager.h"
#include "support/temporary_folder.h"

namespace otrp_test {

class AnyDevice : private TemporaryFolder, public ClientDevice {
 public:
  AnyDevice() : ClientDevice(environment("OTRP_TEST_CONTEXT", path)) {}
};

class AnyScene : public Holds<AnyDevice>, public Manager {
 public:
  AnyScene() : Manager(device) {}
};

}  // namespace otrp_test

#endif
