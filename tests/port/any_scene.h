// SPDX-License-Identifier: BSD-2-Clause
/// The device that port_test is for, of which nothing is known but its Client API, and a TSM that
/// manages it.
#ifndef PORT_ANY_SCENE_H
#define PORT_ANY_SCENE_H

#include <gtest/gtest.h>

#include "common/result_names.h"
#include "support/manager.h"

namespace otrp_test {

/// Whether an answer has this code; says which it has, by name, and where that arose.
inline testing::AssertionResult gave(uint32_t expected, uint32_t code, device::Origin origin) {
  if (code == expected) return testing::AssertionSuccess();
  return testing::AssertionFailure() << device::Error("answered", code, origin).what()
                                     << "; expected " << tools::describe_result(expected);
}
inline testing::AssertionResult gave(uint32_t expected, const Answer &answer) {
  return gave(expected, answer.result, answer.origin);
}
inline testing::AssertionResult gave(uint32_t expected, const Reply &reply) {
  if (reply.result != TEEC_SUCCESS) return gave(expected, reply.answer);
  return gave(expected, reply.status, device::Origin::kStatusWord);
}

struct AnyDevice : ClientDevice {
  AnyDevice() : ClientDevice(environment("OTRP_TEST_CONTEXT", "")) {}
};

struct AnyScene : Holds<AnyDevice>, Manager {
  AnyScene() : Manager(device) {}

  void restart() {
    device.close();
    device.require_open();
  }

  /// A device that lives on is left without SDs and TAs.
  void leave_empty() {
    ASSERT_NO_THROW(device.require_open());
    ASSERT_TRUE(get_device_state().passed());
    const Json sds = sd_list();
    for (const Json &sd : sds) {
      for (const Json &ta : sd["talist"]) EXPECT_TRUE(delete_ta(sd["name"], ta["taid"]).passed());
      EXPECT_TRUE(delete_sd(sd["name"], "true").passed());
    }
  }
};

}  // namespace otrp_test

#endif
