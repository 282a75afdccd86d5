// SPDX-License-Identifier: BSD-2-Clause
// Processes that manage a device on disk are killed at any moment; the next one must find a device
// that starts, tells its state and can be managed. Takes minutes: not part of the suite.
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <random>
#include <thread>

#include "support/scene.h"
#include "support/temporary_folder.h"

namespace otrp_test {
namespace {

constexpr int kNumKills = 200;

// Manages the device until it is killed. A request that a kill has made obsolete may be refused.
[[noreturn]] void manage_for_ever(const std::string &directory, unsigned seed) {
  const tee::test::TraceSink log;
  std::mt19937 random(seed);
  const auto any = [&](const char *prefix) { return prefix + std::to_string(random() % 5); };
  Scene scene("tsm1", directory);
  scene.get_device_state();
  for (;;) {
    const auto id = static_cast<MessageId>(2 + random() % 6);  // what changes something
    scene.run(id, {.spid = any("sp"),
                   .sdname = any("sd"),
                   .spcert = "certificate",
                   .taid = taid(any("ta")),
                   .ta_version = "1",
                   .image = make_image(1000),
                   .renew_aik = true,
                   .deleteta = "true"});
    scene.get_device_state();
  }
}

/// The device starts, tells its state and takes an SD in and out.
bool is_whole(const std::string &directory) {
  const tee::test::TraceSink log;
  Scene scene("tsm1", directory);
  return scene.get_device_state().passed() && scene.create_sd("checker", "checked").passed() &&
         scene.delete_sd("checked", "true").passed();
}

template <class Work>
pid_t in_a_process(Work work) {
  const pid_t child = fork();
  if (child != 0) return child;
  _exit(work() ? 0 : 1);
}

TEST(Kill, AtAnyMomentLeavesADeviceThatCanBeManaged) {
  const TemporaryFolder folder;
  const std::string directory = folder.path / "device";
  tsm_named("tsm1");  // made here, so that all processes are the same TSM
  std::mt19937 random(20161);
  for (int i = 0; i < kNumKills && !HasFailure(); ++i) {
    SCOPED_TRACE(i);
    const auto seed = static_cast<unsigned>(random());
    const pid_t manager = in_a_process([&]() -> bool { manage_for_ever(directory, seed); });
    std::this_thread::sleep_for(std::chrono::microseconds(random() % 400000));
    kill(manager, SIGKILL);
    int status = 0;
    waitpid(manager, &status, 0);
    EXPECT_TRUE(WIFSIGNALED(status)) << status;

    waitpid(in_a_process([&] { return is_whole(directory); }), &status, 0);
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << status;
  }
}

}  // namespace
}  // namespace otrp_test
