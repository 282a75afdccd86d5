// SPDX-License-Identifier: BSD-2-Clause
/// From what an operator typed to what a message needs: files are read and checked. Everything here
/// throws tools::UsageError.
#ifndef TSM_CLI_OPERATOR_INPUT_H
#define TSM_CLI_OPERATOR_INPUT_H

#include "tsm/cli/commands.h"
#include "tsm/cli/exchange.h"

namespace tsm {

/// The message that `arguments` name. Reads each file once, however many devices there are.
Order read_order(const Arguments &arguments);

}  // namespace tsm

#endif
