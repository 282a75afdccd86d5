// SPDX-License-Identifier: BSD-2-Clause
// Runs a target over every file of the folders that are named: what was found once stays found,
// with any compiler.
#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <string>
#include <vector>

#include "common/files.h"
#include "support/inside.h"
#include "support/require.h"

namespace {

std::vector<std::string> files_in(const char *folder) {
  std::vector<std::string> paths;
  for (const auto &entry : std::filesystem::directory_iterator(folder)) {
    paths.push_back(entry.path());
  }
  std::ranges::sort(paths);
  return paths;
}

}  // namespace

int main(int argc, char **argv) {
  size_t num_files = 0;
  for (int i = 1; i < argc; ++i) {
    for (const std::string &path : files_in(argv[i])) {
      std::fprintf(stderr, "%s\n", path.c_str());
      const std::string input = tools::read_file(path);
      LLVMFuzzerTestOneInput(fuzz::ExactBytes(input).get(), input.size());
      ++num_files;
    }
  }
  std::printf("%zu inputs\n", num_files);
  return num_files == 0 ? 1 : 0;
}
