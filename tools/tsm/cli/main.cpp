// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/cli/cli.h"

int main(int argc, char **argv) {
  return tsm::run_command_line({argv, static_cast<size_t>(argc)});
}
