// SPDX-License-Identifier: BSD-2-Clause
// Runs a target over every file of the folders that are named: what was found once stays found,
// with any compiler.
#include <filesystem>

#include "common/files.h"
#include "support/require.h"

int main(int argc, char **argv) {
  size_t num_files = 0;
  for (int i = 1; i < argc; ++i) {
    for (const auto &entry : std::filesystem::directory_iterator(argv[i])) {
      std::fprintf(stderr, "%s\n", entry.path().c_str());
      fuzz::check(tools::read_file(entry.path()));
      ++num_files;
    }
  }
  std::printf("%zu inputs\n", num_files);
  return num_files == 0 ? 1 : 0;
}
