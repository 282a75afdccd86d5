// SPDX-License-Identifier: BSD-2-Clause
/// Where a device calls.
#ifndef DEVICE_BROKER_DEVICE_URL_H
#define DEVICE_BROKER_DEVICE_URL_H

#include <string>
#include <string_view>

namespace broker {

/// A TSM knows a device by the last part of the address that it calls, its ID. `url` may end in the
/// ID or is what stands before it, so that all devices can be given the same. Throws
/// tools::UsageError for what is no URL to call.
std::string device_url(std::string url, std::string_view device_id);

}  // namespace broker

#endif
