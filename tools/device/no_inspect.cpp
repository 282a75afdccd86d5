// SPDX-License-Identifier: BSD-2-Clause
#include "device/inspect.h"

namespace device {

const Inspection *inspection() {
  return nullptr;
}

}  // namespace device
