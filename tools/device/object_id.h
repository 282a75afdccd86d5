// SPDX-License-Identifier: BSD-2-Clause
/// Storage object IDs, which are any bytes, as printable text: bytes outside printable ASCII and
/// the backslash appear as `\xNN`.
#ifndef DEVICE_OBJECT_ID_H
#define DEVICE_OBJECT_ID_H

#include <string>
#include <string_view>

namespace device {

std::string show_object_id(std::string_view id);

/// Throws tools::UsageError for a backslash that does not begin a `\xNN`.
std::string parse_object_id(std::string_view text);

}  // namespace device

#endif
