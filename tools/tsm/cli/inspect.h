// SPDX-License-Identifier: BSD-2-Clause
/// What a message is, from a file: `otrp-tsm inspect`.
#ifndef TSM_CLI_INSPECT_H
#define TSM_CLI_INSPECT_H

#include "tsm/cli/commands.h"

namespace tsm {

/// Prints what was found out about each of `arguments.input_files`. Returns 0, or kExitNotVerified
/// when a check failed.
int run_inspect(const Arguments &arguments);

}  // namespace tsm

#endif
