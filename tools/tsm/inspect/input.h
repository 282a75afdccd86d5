// SPDX-License-Identifier: BSD-2-Clause
/// What an inspected file holds: a message, a frame of the command interface around one, an
/// exchange as in docs/examples, a TA image, a device state, a device file, or a failure of the
/// HTTP service.
#ifndef TSM_INSPECT_INPUT_H
#define TSM_INSPECT_INPUT_H

#include <string>
#include <string_view>

#include "tsm/inspect/keys.h"

namespace tsm {

/// `name` is the file's, for the report.
void inspect_bytes(const std::string &name, std::string_view bytes, const AtHand &at_hand,
                   Report *report);

}  // namespace tsm

#endif
