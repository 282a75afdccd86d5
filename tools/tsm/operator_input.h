// SPDX-License-Identifier: BSD-2-Clause
/// From what an operator typed to what a request needs: files are read and
/// checked against what the message and the device need. Everything here throws tools::UsageError.
#ifndef TSM_OPERATOR_INPUT_H
#define TSM_OPERATOR_INPUT_H

#include <optional>
#include <string>

#include "tsm/commands.h"
#include "tsm/json.h"

namespace tsm {

/// Parses a state document as --dsi-out writes it.
Json parse_dsi(const std::string &text);

/// The complete options of the request that `arguments` ask for. `dsi` is the last known state of
/// the device; the messages that change something cannot do without.
RequestOptions prepare_options(const Arguments &arguments, const std::optional<Json> &dsi);

}  // namespace tsm

#endif
