// SPDX-License-Identifier: BSD-2-Clause
/// What the command lines of the programs have in common, over CLI11.
#ifndef COMMON_COMMAND_LINE_H
#define COMMON_COMMAND_LINE_H

#include <CLI/App.hpp>
#include <span>

namespace tools {

/// Reads the words of a command line, the program's name first. Options may stand before, between
/// and behind the commands that they belong to.
///
/// Returns whether there is something to do: help, which the program's name alone asks for as well,
/// and version have been printed. Throws UsageError, with what was meant perhaps.
bool parse_command_line(CLI::App &app, std::span<char *> words);

}  // namespace tools

#endif
