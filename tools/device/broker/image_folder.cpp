// SPDX-License-Identifier: BSD-2-Clause
#include "device/broker/image_folder.h"

#include <unistd.h>

#include <filesystem>
#include <system_error>
#include <utility>

#include "common/error_line.h"
#include "common/files.h"

namespace broker {
namespace {

constexpr size_t kMaxNameLen = 64;
constexpr std::string_view kNameCharacters =
    "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789-_.";
constexpr std::string_view kNeverFirst = "-_.";

bool is_plain_name(std::string_view name) {
  return !name.empty() && name.size() <= kMaxNameLen &&
         name.find_first_not_of(kNameCharacters) == name.npos &&
         kNeverFirst.find(name.front()) == kNeverFirst.npos;
}

}  // namespace

ImageFolder::ImageFolder(std::string folder) : folder_(std::move(folder)) {
  std::error_code unknown;
  if (!std::filesystem::is_directory(folder_, unknown) ||
      access(folder_.c_str(), W_OK | X_OK) != 0) {
    throw tools::UsageError("cannot keep TA images in " + folder_ +
                            ": expected a folder that can be written to");
  }
}

void ImageFolder::keep(const std::string &taid, std::string_view image) const {
  if (!is_plain_name(taid)) {
    throw tools::UsageError("bad TA ID \"" + taid.substr(0, kMaxNameLen) +
                            "\": expected letters, digits and \"-_.\" for a file's name");
  }
  tools::write_file((std::filesystem::path(folder_) / (taid + ".img")).string(), image);
}

}  // namespace broker
