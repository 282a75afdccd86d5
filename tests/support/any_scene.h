// SPDX-License-Identifier: BSD-2-Clause
/// For the cases that need nothing but the Client API: the device that OTRP_TEST_CONTEXT names, or
/// else a new one of the host TEE. It must have no security domains.
#ifndef SUPPORT_ANY_SCENE_H
#define SUPPORT_ANY_SCENE_H

#include <gtest/gtest.h>

#include <filesystem>

#include "support/manager.h"

namespace otrp_test {

struct TemporaryDirectory {
  TemporaryDirectory() = default;
  TemporaryDirectory(const TemporaryDirectory &) = delete;
  TemporaryDirectory &operator=(const TemporaryDirectory &) = delete;
  ~TemporaryDirectory() { std::filesystem::remove_all(path); }

  const std::string path = testing::TempDir() + "device-" + tsm::random_id();
};

class AnyDevice : private TemporaryDirectory, public ClientDevice {
 public:
  AnyDevice() : ClientDevice(environment("OTRP_TEST_CONTEXT", path)) {}
};

class AnyScene : public Holds<AnyDevice>, public Manager {
 public:
  AnyScene() : Manager(device) {}
};

}  // namespace otrp_test

#endif
