// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/cli/inspect.h"

#include <unistd.h>

#include <cstdlib>
#include <filesystem>

#include "common/files.h"
#include "tsm/cli/target.h"
#include "tsm/home/home.h"
#include "tsm/inspect/input.h"
#include "tsm/protocol/dsi.h"

namespace tsm {
namespace {

struct PartyName {
  std::string_view name;
  Party party;
};

constexpr PartyName kParties[] = {
    {"tsm", Party::kTsm}, {"ca", Party::kCa}, {"tee", Party::kDevice}, {"aik", Party::kProvider}};

/// `ca=FILE` says whose key it is.
Party take_party(std::string *file) {
  for (const auto &[name, party] : kParties) {
    if (!file->starts_with(std::string(name) + "=")) continue;
    file->erase(0, name.size() + 1);
    return party;
  }
  return Party::kAny;
}

/// A JSON Web Key (RFC 7517), or a PEM text.
std::optional<RsaKey> key_of(const Json &value) {
  if (value.is_string()) return RsaKey::from_pem(value.get_ref<const std::string &>());
  const auto number = [&](const char *name) {
    const std::string *text = find_string(value, name);
    return text == nullptr ? std::nullopt : base64url_decode(*text);
  };
  const std::optional<Bytes> n = number("n");
  const std::optional<Bytes> e = number("e");
  return n && e ? RsaKey::from_numbers(*n, *e, number("d").value_or("")) : std::nullopt;
}

/// The keys that a JSON file has as its members, such as docs/examples/keys.json.
void add_keys_of(const Json &document, const std::string &file, Party party, AtHand *at_hand) {
  if (!document.is_object()) return;
  for (const auto &[member, value] : document.items()) {
    const std::optional<RsaKey> key = key_of(value);
    if (!key) continue;
    std::string rest = member;
    for (char &c : rest) c = c == '_' ? '=' : c;
    const Party named = take_party(&rest);
    at_hand->keys.push_back({member + " of " + file, *key, party == Party::kAny ? named : party});
  }
}

void add_key_file(std::string file, AtHand *at_hand) {
  const Party party = take_party(&file);
  const std::string text = tools::read_file(file);
  const size_t num_before = at_hand->keys.size();
  if (const std::optional<RsaKey> key = RsaKey::from_pem(text)) {
    at_hand->keys.push_back({file, *key, party});
  } else if (const std::optional<Json> document = parse_json(text)) {
    const std::optional<RsaKey> web_key = key_of(*document);
    if (web_key) at_hand->keys.push_back({file, *web_key, party});
    if (!web_key) add_keys_of(*document, file, party, at_hand);
  }
  if (at_hand->keys.size() > num_before) return;
  throw tools::UsageError(file + " holds no RSA key: expected PEM text, or JSON with keys in it");
}

void add_device(const DeviceInfo &device, const std::string &name, bool was_named,
                AtHand *at_hand) {
  at_hand->keys.push_back(
      {"the TEE key of " + name, device.tee_key, Party::kDevice, {}, was_named});
  if (was_named) at_hand->device_id = device.device_id;
}

/// A TSM that lives in the home lends its own keys, and what it knows of devices.
void add_home(const Home &home, bool has_device, AtHand *at_hand) {
  const Identity tsm = home.load_identity();
  at_hand->keys.push_back({"the TSM " + tsm.tsmid, tsm.key, Party::kTsm, tsm.tsmid, false});
  if (tsm.ca) {
    at_hand->keys.push_back({"the CA-TSM of " + tsm.tsmid, *tsm.ca, Party::kCa, tsm.tsmid, false});
  }
  if (has_device) return;
  const std::vector<KnownDevice> devices = home.known_devices();
  for (const KnownDevice &known : devices) {
    const std::string name = "device " + known.device.device_id;
    add_device(known.device, name, false, at_hand);
    const std::optional<std::string> dsi_text = read_dsi_text(known.folder);
    if (dsi_text) at_hand->states.push_back({"the state of " + name, *dsi_text, false});
  }
  if (devices.size() == 1) at_hand->device_id = devices.front().device.device_id;
}

AtHand read_at_hand(const Arguments &arguments) {
  AtHand at_hand;
  for (const std::string &file : arguments.key_files) add_key_file(file, &at_hand);
  const Home home(arguments.home);
  const std::optional<DeviceInfo> named = find_named_device(arguments, home);
  const bool has_home = std::filesystem::exists(arguments.home + "/tsm.json");
  if (named) {
    const std::string name = arguments.on.empty() ? arguments.device_file : arguments.on.front();
    add_device(*named, name, true, &at_hand);
    const std::optional<std::string> known =
        has_home ? read_dsi_text(home.folder_of(*named)) : std::nullopt;
    if (known && arguments.dsi_file.empty()) {
      at_hand.states.push_back({"the state of " + name + " in the home", *known});
    }
  }
  if (!arguments.dsi_file.empty()) {
    const std::string text = tools::read_file(arguments.dsi_file);
    (void)parse_dsi(text);  // throws when it is none
    at_hand.states.push_back({arguments.dsi_file, text});
  }
  if (has_home) add_home(home, named.has_value(), &at_hand);
  return at_hand;
}

bool wants_colours() {
  return isatty(STDOUT_FILENO) != 0 && std::getenv("NO_COLOR") == nullptr;
}

}  // namespace

int run_inspect(const Arguments &arguments) {
  const AtHand at_hand = read_at_hand(arguments);
  std::vector<std::string> inputs;
  for (const std::string &file : arguments.input_files) inputs.push_back(tools::read_file(file));
  Report report;
  for (size_t i = 0; i < inputs.size(); ++i) {
    inspect_bytes(arguments.input_files[i], inputs[i], at_hand, &report);
  }
  tools::write_file("-", arguments.json ? report_json(report).dump(2) + "\n"
                                        : report_text(report, wants_colours()));
  return report.has_failure() ? kExitNotVerified : 0;
}

}  // namespace tsm
