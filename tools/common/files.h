// SPDX-License-Identifier: BSD-2-Clause
/// Whole files in and out. A path of "-" is standard input or standard output.
///
/// Failures throw UsageError with the path and the system's reason. Bytes travel in std::string.
#ifndef COMMON_FILES_H
#define COMMON_FILES_H

#include <string>
#include <string_view>

#include "common/error_line.h"

namespace tools {

enum class FileAccess { kShared, kOwnerOnly };  // as the umask says, or 0600

std::string read_file(const std::string &path);

/// Replaces the file as a whole or leaves it as it was: the bytes go to a file beside it, which is
/// renamed when they are safely on disk. What is not a regular file (a pipe, a device) is written
/// to directly.
void write_file(const std::string &path, std::string_view bytes,
                FileAccess access = FileAccess::kShared);

}  // namespace tools

#endif
