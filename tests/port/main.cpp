// SPDX-License-Identifier: BSD-2-Clause
/// port_test: plays a device's life over the Client API that it was built for.
#include <gmock/gmock.h>

#include <CLI/CLI.hpp>
#include <cstdlib>
#include <filesystem>

#include "device/inspect.h"
#include "tsm/protocol/request.h"

namespace {

/// Options that the cases look up as environment variables.
constexpr struct {
  const char *name;
  const char *variable;
  const char *type;
  const char *help;
} kOptions[] = {
    {"--context", "OTRP_TEST_CONTEXT", "NAME",
     "Name of the TEE for its Client API (default: NULL; of the host TEE: a new state directory)"},
    {"--device", "OTRP_TEST_DEVICE", "FILE",
     "What `otrp-device info` says of the device (default: the key service is asked)"},
    {"--ca", "OTRP_TEST_CA", "PEM",
     "Private key behind the one that the agent was built with (default: the development key)"},
};

/// The host TEE has no device of its own: without a name it gets a new one.
struct NewDevice {
  NewDevice() {
    if (getenv("OTRP_TEST_CONTEXT") != nullptr || device::inspection() == nullptr) return;
    path = testing::TempDir() + "device-" + tsm::random_id();
    setenv("OTRP_TEST_CONTEXT", path.c_str(), 1);
  }
  ~NewDevice() {
    if (!path.empty()) std::filesystem::remove_all(path);
  }
  std::string path;
};

int run(int argc, char **argv) {
  CLI::App app("Checks a port of the OTrP agent: plays a device's life with a TSM", "port_test");
  app.footer(
      "The device must have no security domains, and has none afterwards but between the two\n"
      "runs of an interrupted life. Other options are GoogleTest's: --gtest_filter=Life.*\n"
      "Exit: 0 all passed, 1 something failed, 2 wrong usage.\n");
  for (const auto &option : kOptions) {
    app.add_option_function<std::string>(
           option.name,
           [&option](const std::string &value) { setenv(option.variable, value.c_str(), 1); },
           option.help)
        ->type_name(option.type);
  }
  bool before = false;
  bool after = false;
  CLI::Option *first = app.add_flag(
      "--before-cut", before, "Begin a life; then cut the power, or kill what stores objects");
  app.add_flag("--after-cut", after, "Check that this life goes on, and end it")->excludes(first);

  app.allow_extras();  // GoogleTest's
  try {
    app.parse(argc, argv);
    for (const std::string &word : app.remaining()) {
      if (!word.starts_with("--gtest_")) throw CLI::ExtrasError({word});
    }
  } catch (const CLI::ParseError &error) {
    return app.exit(error) == 0 ? 0 : 2;
  }
  testing::InitGoogleMock(&argc, argv);
  if (before || after) {
    GTEST_FLAG_SET(filter, before ? "Cut.DISABLED_Before" : "Cut.DISABLED_After");
    GTEST_FLAG_SET(also_run_disabled_tests, true);
  }
  const NewDevice device;
  return RUN_ALL_TESTS();
}

}  // namespace

int main(int argc, char **argv) {
  return run(argc, argv);
}
