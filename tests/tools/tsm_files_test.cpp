// SPDX-License-Identifier: BSD-2-Clause
// What the TSM keeps must be on the disk before it counts, and so must be its name.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <filesystem>
#include <vector>

#include "common/files.h"
#include "program.h"

static std::vector<std::string> g_calls;

// In place of the C library's, for all of this program.
extern "C" int fsync(int fd) {
  g_calls.push_back("sync " + std::filesystem::read_symlink("/proc/self/fd/" + std::to_string(fd))
                                  .filename()
                                  .string()
                                  .substr(0, 5));
  return static_cast<int>(syscall(SYS_fsync, fd));
}

extern "C" int rename(const char *from, const char *to) noexcept {
  g_calls.push_back("rename to " + std::filesystem::path(to).filename().string());
  return static_cast<int>(syscall(SYS_renameat, AT_FDCWD, from, AT_FDCWD, to));
}

namespace {

TEST(Files, AreOnTheDiskBeforeTheyCountAndSoAreTheirNames) {
  const TemporaryFolder folder;
  std::filesystem::create_directory(folder.path / "home");
  for (const char *text : {"old", "new"}) {
    g_calls.clear();
    tools::write_file(folder.path / "home" / "state", text);
    EXPECT_EQ(g_calls, (std::vector<std::string>{"sync state", "rename to state", "sync home"}));
    EXPECT_EQ(tools::read_file(folder.path / "home" / "state"), text);
  }
}

}  // namespace
