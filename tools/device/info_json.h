// SPDX-License-Identifier: BSD-2-Clause
/// What a TSM operator needs to know of a device, as the JSON line that otrp-tsm reads.
#ifndef DEVICE_INFO_JSON_H
#define DEVICE_INFO_JSON_H

#include <string>

#include "device/device_client.h"

namespace device {

/// With a final line feed.
std::string info_json(const Info &info);

}  // namespace device

#endif
