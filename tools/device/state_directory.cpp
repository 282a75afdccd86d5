// SPDX-License-Identifier: BSD-2-Clause
#include "device/state_directory.h"

#include <algorithm>
#include <filesystem>

#include "common/error_line.h"
#include "device/inspect.h"

namespace device {
namespace {

namespace fs = std::filesystem;

/// What cannot be looked into is left to the TEE, which says why.
bool has_device(const std::string &directory) {
  if (inspection() == nullptr) return true;  // a device of its own
  std::error_code failure;
  const auto status = fs::status(directory, failure);
  if (status.type() == fs::file_type::not_found) return false;
  const fs::directory_iterator entries(directory, failure);
  return failure || std::any_of(begin(entries), end(entries), [](const fs::directory_entry &entry) {
           return entry.path().extension() == ".db";
         });
}

/// Whether to open it makes a device.
bool makes_device(const std::string &directory, bool must_exist) {
  if (has_device(directory)) return false;
  if (!must_exist) return true;
  throw tools::UsageError("there is no device in " + directory + ": expected its state directory");
}

std::string absolute(const std::string &directory) {
  std::error_code failure;
  const fs::path path = fs::canonical(directory, failure);
  return failure ? directory : path.string();
}

}  // namespace

StateDevice::StateDevice(const std::string &directory, bool must_exist)
    : StateDevice(directory, makes_device(directory, must_exist) ? Making::kYes : Making::kNo) {}

StateDevice::StateDevice(const std::string &directory, Making making) : Device(directory) {
  if (making == Making::kNo) return;
  tools::print_error_line("note", "made a new device in " + absolute(directory));
}

}  // namespace device
