// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/cli/commands.h"

#include <filesystem>
#include <vector>

#include "common/error_line.h"
#include "common/files.h"
#include "tsm/cli/exchange.h"
#include "tsm/cli/operator_input.h"
#include "tsm/cli/outcome.h"
#include "tsm/cli/report.h"
#include "tsm/cli/target.h"
#include "tsm/home/home.h"
#include "tsm/protocol/dsi.h"
#include "tsm/protocol/image.h"
#include "tsm/protocol/response.h"

namespace tsm {
namespace {

using tools::UsageError;

constexpr std::string_view kDevCaName = "dev-ca-tsm.pem";

void print(const std::string &text) {
  tools::write_file("-", text);
}
void print_json(const Json &value) {
  print(value.dump(2) + "\n");
}

/// Beside the program, in a build as in an installation.
std::string default_ca_file() {
  std::error_code failure;
  const std::filesystem::path program = std::filesystem::read_symlink("/proc/self/exe", failure);
  return program.parent_path().parent_path() / "share" / "otrp" / kDevCaName;
}

}  // namespace

int run_init(const Arguments &arguments) {
  const std::string tsmid = arguments.tsmid.empty() ? "tsm-" + random_id() : arguments.tsmid;
  const std::string ca = arguments.ca_file.empty() ? default_ca_file() : arguments.ca_file;
  const Identity tsm = Home(arguments.home).create(tsmid, tools::read_file(ca));
  print("TSM " + tsm.tsmid + "  key " + tsm.key.fingerprint() + "  CA-TSM key " +
        tsm.ca->fingerprint() + "  in " + arguments.home + "\n");
  return 0;
}

int run_request(const Arguments &arguments) {
  const Order order = read_order(arguments);
  const Home home(arguments.home);
  const Identity tsm = home.load_identity();
  DeviceRecord record = home.open_record(named_device(arguments, home));
  const std::optional<Json> dsi = state_for(arguments.message, record, arguments.dsi_file);
  tools::OutputFile output(arguments.output_file);
  output.write(make_kept_request(order, tsm, dsi, &record).text);
  return 0;
}

int run_response(const Arguments &arguments) {
  const Home home(arguments.home);
  const Identity tsm = home.load_identity();
  const std::string text = tools::read_file(arguments.response_file);
  TiePolicy policy = {.accept_old = arguments.accept_old};
  if (!arguments.request_file.empty()) {
    policy.named = read_request(tools::read_file(arguments.request_file), tsm.key);
  }

  DeviceRecord record = home.open_record(named_device(arguments, home));
  const std::optional<Json> dsi = state_for(
      parse_envelope(text).message->id == MessageId::kGetTaInfo ? MessageId::kGetTaInfo
                                                                : MessageId::kGetDeviceState,
      record, arguments.dsi_file);
  const Response response = open_response(
      text, {.tee_key = record.device().tee_key, .tsm_key = tsm.key, .dsi = dsi ? &*dsi : nullptr});
  const Tie tie = record.take(response, policy);
  if (response.dsi_text && !arguments.dsi_out_file.empty()) {
    tools::write_file(arguments.dsi_out_file, *response.dsi_text);
  }
  return print_outcome(outcome_of(arguments, {.response = response, .tie = tie}), false);
}

int run_image_pack(const Arguments &arguments) {
  tools::write_file(arguments.output_file, pack_image(tools::read_file(arguments.input_file)));
  return 0;
}

int run_image_show(const Arguments &arguments) {
  const std::string image = tools::read_file(arguments.input_file);
  const std::optional<Image> parsed = parse_image(image);
  if (!parsed) {
    throw UsageError(arguments.input_file +
                     " has no TA image header: expected an image made by `otrp-tsm image pack`");
  }
  if (arguments.json) {
    print_json({{"digest", hex_encode(parsed->digest)},
                {"payload_len", parsed->payload.size()},
                {"digest_matches", parsed->digest_matches}});
  } else {
    print("digest   " + hex_encode(parsed->digest) + "\npayload  " +
          std::to_string(parsed->payload.size()) + " bytes, " +
          (parsed->digest_matches ? "digest matches" : "digest does not match") + "\n");
  }
  return 0;
}

}  // namespace tsm
