// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/commands.h"

#include <filesystem>
#include <vector>

#include "common/error_line.h"
#include "common/files.h"
#include "common/result_names.h"
#include "device/device_client.h"
#include "tsm/dsi.h"
#include "tsm/home.h"
#include "tsm/image.h"
#include "tsm/operator_input.h"
#include "tsm/report.h"
#include "tsm/response.h"

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

/// The state that the operator names, or the one that the home keeps.
std::optional<Json> known_state(const Home &home, const DeviceInfo &device,
                                const std::string &dsi_file) {
  return parse_known_dsi(dsi_file.empty() ? home.load_dsi(device)
                                          : std::optional(tools::read_file(dsi_file)));
}

/// Keeps and shows what a verified response brought; the exit code says whether it is a refusal.
int finish_response(const Arguments &arguments, const Home &home, const DeviceInfo &device,
                    const Response &response) {
  if (response.dsi_text) home.keep_dsi(device, *response.dsi_text);
  if (response.dsi_text && !arguments.dsi_out_file.empty()) {
    tools::write_file(arguments.dsi_out_file, *response.dsi_text);
  }
  const bool is_refusal = response.error_code.has_value();
  if (arguments.json) {
    print_json(report_json(response));
  } else if (!is_refusal && arguments.dsi_out_file != "-") {
    print(report_lines(response));
  }
  if (!is_refusal) return 0;
  tools::print_error_line("otrp-tsm", "the device refused " +
                                          std::string(response.message->command) + ": " +
                                          tools::describe_result(*response.error_code));
  return tools::kExitRefused;
}

/// A verified response proves who sent it, not that it answers this very request.
void check_answers(const Response &response, const RequestOptions &options) {
  const bool is_ta_info = response.message->id == MessageId::kGetTaInfo;
  const std::pair<const char *, const std::string &> echoes[] = {
      {is_ta_info ? "spid" : "rid", is_ta_info ? options.spid : options.rid},
      {is_ta_info ? "taid" : "tid", is_ta_info ? options.taid : options.tid}};
  for (const auto &[name, sent] : echoes) {
    const std::string *echo = find_string(response.members, name);
    const bool may_lack_it = response.error_code.has_value();
    if (echo == nullptr ? !may_lack_it : *echo != sent) {
      throw NotVerified("the response answers another request: its \"" + std::string(name) +
                        "\" differs");
    }
  }
}

int manage(const Arguments &arguments) {
  const Home home(arguments.home);
  const Identity tsm = home.load_identity();
  device::Device machine(arguments.state_dir);
  const device::Info info = device::read_info(machine);
  const std::optional<RsaKey> tee_key = RsaKey::from_encoded(info.tee_public_key);
  if (!tee_key) throw NotVerified("the device's TEE key is no RSA key");
  const DeviceInfo device = {info.device_id, *tee_key};

  const std::optional<Json> dsi = known_state(home, device, "");
  const Json *document = dsi ? &*dsi : nullptr;
  RequestOptions options = prepare_options(arguments, dsi);
  if (options.rid.empty()) options.rid = random_id();
  if (options.tid.empty()) options.tid = random_id();
  const std::string request = make_request(arguments.message, options, tsm, device, document);

  const std::string name(message_of(arguments.message).command);
  const device::Message &message = *device::find_message(name);
  device::Session agent(machine, device::kAgentUuid);
  const device::Answer answer = device::send(agent, message, request);
  if (answer.response.empty()) device::require_success(message, answer);
  const Response response = open_response(
      answer.response, {.tee_key = device.tee_key, .tsm_key = tsm.key, .dsi = document});
  check_answers(response, options);
  if (answer.image && !arguments.image_out_file.empty()) {
    tools::write_file(arguments.image_out_file, *answer.image);
  }
  const int exit_code = finish_response(arguments, home, device, response);
  device::require_success(message, answer);  // the message may have passed and its image not fit
  return exit_code;
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
  const Home home(arguments.home);
  const Identity tsm = home.load_identity();
  const DeviceInfo device = parse_device_info(tools::read_file(arguments.device_file));
  const std::optional<Json> dsi = known_state(home, device, arguments.dsi_file);
  const RequestOptions options = prepare_options(arguments, dsi);
  const std::string request =
      make_request(arguments.message, options, tsm, device, dsi ? &*dsi : nullptr);
  tools::write_file(arguments.output_file, request);
  return 0;
}

int run_response(const Arguments &arguments) {
  const Home home(arguments.home);
  const Identity tsm = home.load_identity();
  const DeviceInfo device = parse_device_info(tools::read_file(arguments.device_file));
  const std::optional<Json> dsi = known_state(home, device, arguments.dsi_file);
  const Response response =
      open_response(tools::read_file(arguments.response_file),
                    {.tee_key = device.tee_key, .tsm_key = tsm.key, .dsi = dsi ? &*dsi : nullptr});
  return finish_response(arguments, home, device, response);
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

int run_manage(const Arguments &arguments) {
  try {
    return manage(arguments);
  } catch (const device::Error &error) {
    tools::print_error_line("otrp-tsm", error.what());
    return tools::kExitRefused;
  }
}

int run_show(const Arguments &arguments) {
  if (!arguments.dsi_file.empty()) {
    const Json dsi = parse_dsi(tools::read_file(arguments.dsi_file));
    print(arguments.json ? dsi.dump(2) + "\n" : device_lines(nullptr, &dsi));
    return 0;
  }
  const Home home(arguments.home);
  std::vector<KnownDevice> devices = home.known_devices();
  if (!arguments.device_file.empty()) {
    const DeviceInfo device = parse_device_info(tools::read_file(arguments.device_file));
    devices = {{device, home.load_dsi(device)}};
  }
  if (devices.empty() && !arguments.json) {
    print("no devices known in " + arguments.home + ": run get-device-state\n");
  }

  Json list = Json::array();
  for (const KnownDevice &known : devices) {
    const std::optional<Json> dsi = parse_known_dsi(known.dsi_text);
    const Json *document = dsi ? &*dsi : nullptr;
    if (arguments.json) {
      list.push_back(device_json(known.device, document));
    } else {
      print(device_lines(&known.device, document));
    }
  }
  if (arguments.json) print_json(list);
  return 0;
}

}  // namespace tsm
