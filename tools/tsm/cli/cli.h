// SPDX-License-Identifier: BSD-2-Clause
/// The command line of otrp-tsm: its commands, options, help and checks of single values.
#ifndef TSM_CLI_CLI_H
#define TSM_CLI_CLI_H

#include <span>

namespace tsm {

/// Runs one command line and returns the exit code: 0, 1 when the device refused, 2 for wrong
/// input, 3 for a response that does not verify. Failures are one line on standard error.
int run_command_line(std::span<char *> words);

}  // namespace tsm

#endif
