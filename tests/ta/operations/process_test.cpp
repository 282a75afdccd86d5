// SPDX-License-Identifier: BSD-2-Clause
// The process functions called directly, with each allocation failing in turn: what they say then.
#include <set>

#include "operations/operations.h"
#include "state/token_reader.h"
#include "support/inside_agent.h"
#include "support/log_rows.h"

namespace otrp_test {
namespace {

const struct {
  std::string message;  // rows of the log begin with it
  process_function process;
  std::string request;
} kProcesses[] = {
    {"GetDeviceState", getdevstat_process, "GetDeviceStateTBSRequest"},
    {"InstallTa", installta_process, "InstallTATBSRequest"},
    {"UpdateTa", updateta_process, "UpdateTATBSRequest"},
    {"DeleteTa", deleteta_process, "DeleteTATBSRequest"},
    {"CreateSd", createsd_process, "CreateSDTBSRequest"},
    {"UpdateSd", updatesd_process, "UpdateSDTBSRequest"},
    {"DeleteSd", deletesd_process, "DeleteSDTBSRequest"},
};

class Process : public InsideAgent {};

// Each row about lacking memory comes of some allocation that fails.
TEST_F(Process, SaysWhatThereWasNoMemoryFor) {
  const LogRows rows = read_log_rows();
  for (const auto &[message, process, request] : kProcesses) {
    SCOPED_TRACE(message);
    const std::string text = "{\"" + request + R"(":{"rid":"r","tid":"t","dsihash":"0"}})";
    const jsmn_string slice = {text.data(), len_of(text)};
    const token_object_ptr payload(jsmn_init_object(&slice));
    std::set<std::string> all;
    for (unsigned n = 1, fired = 1; fired != 0; ++n) {
      device.fail({}, tee::test::Fault::kAllocation, n);
      tee_ptr<char> response;
      ta_image image = {};
      (void)process("tsm1", payload.get(), out(response), &image, nullptr);
      fired = device.fault_report().fired;
      all.insert(said(log));
    }
    device.clear_faults();
    size_t num_rows = 0;
    for (const auto &[name, lines] : rows) {
      if (!name.starts_with(message + ", no memory for ")) continue;
      EXPECT_TRUE(all.contains(lines)) << name;
      ++num_rows;
    }
    EXPECT_GT(num_rows, 2u);
  }
}

}  // namespace
}  // namespace otrp_test
