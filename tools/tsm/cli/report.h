// SPDX-License-Identifier: BSD-2-Clause
/// Verified responses and device states as an operator reads them: a few lines, or JSON.
#ifndef TSM_CLI_REPORT_H
#define TSM_CLI_REPORT_H

#include <string>
#include <string_view>

#include "tsm/protocol/json.h"
#include "tsm/protocol/parties.h"
#include "tsm/protocol/response.h"
#include "tsm/protocol/waiting.h"

namespace tsm {

/// Lines for a response that is not a refusal.
std::string report_lines(const Response &response, Tie tie);

Json report_json(const Response &response, Tie tie);

/// One device: a heading, and its state as a tree. `dsi` is NULL when the state is not known.
std::string device_lines(const DeviceInfo *device, const Json *dsi);
Json device_json(const DeviceInfo &device, const Json *dsi);

}  // namespace tsm

#endif
