// SPDX-License-Identifier: BSD-2-Clause
/// An empty folder that goes with its owner.
#ifndef SUPPORT_TEMPORARY_FOLDER_H
#define SUPPORT_TEMPORARY_FOLDER_H

#include <cstdlib>
#include <filesystem>
#include <string>

class TemporaryFolder {
 public:
  TemporaryFolder() {
    std::string name = std::filesystem::temp_directory_path() / "otrp-test-XXXXXX";
    path = ::mkdtemp(name.data());
  }
  ~TemporaryFolder() { std::filesystem::remove_all(path); }
  TemporaryFolder(const TemporaryFolder &) = delete;
  TemporaryFolder &operator=(const TemporaryFolder &) = delete;

  std::filesystem::path path;
};

#endif
