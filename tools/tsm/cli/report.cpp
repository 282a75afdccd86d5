// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/cli/report.h"

#include "common/result_names.h"
#include "tsm/protocol/dsi.h"

namespace tsm {
namespace {

std::string line(std::string_view label, std::string_view text) {
  std::string padded(label);
  padded.resize(12, ' ');
  return padded + printable(text) + "\n";
}

/// A line for a text member that is there and not empty.
std::string member_line(const Json &object, std::string_view name) {
  const std::string *text = find_string(object, name);
  return text == nullptr || text->empty() ? "" : line(name, *text);
}

std::string aik_line(const Json &content) {
  const std::string *text = find_string(content, "teespaik");
  const std::optional<Bytes> encoded = text == nullptr ? std::nullopt : base64url_decode(*text);
  const std::optional<RsaKey> aik = encoded ? RsaKey::from_encoded(*encoded) : std::nullopt;
  return aik ? line("AIK", aik->fingerprint()) : "";
}

Json reason_json(uint32_t code) {
  const tools::ResultName *result = tools::find_result(code);
  return {{"error_code", code},
          {"code", tools::code_text(code)},
          {"name", result == nullptr ? "" : result->name},
          {"hint", result == nullptr ? "" : result->hint}};
}

}  // namespace

std::string report_lines(const Response &response, Tie tie) {
  const bool is_ta_info = response.message->id == MessageId::kGetTaInfo;
  std::string lines = std::string(response.message->response) + ": signature verified with the " +
                      (is_ta_info ? "SP's AIK" : "device's TEE key") + "\n";
  for (const char *name :
       {"rid", "tid", "status", "taid", "spid", "tsmid", "ta_version", "signercert"}) {
    lines += member_line(response.members, name);
  }
  if (tie != Tie::kIds) lines += line("tied by", tie_text(tie));
  lines += member_line(response.content, "sdname") + aik_line(response.content);
  if (response.dsi_text) {
    lines += line("DSI hash", dsi_hash_of_text(*response.dsi_text));
    const std::optional<Json> dsi = parse_json(*response.dsi_text);
    lines += device_lines(nullptr, dsi ? &*dsi : nullptr);
  }
  return lines;
}

Json report_json(const Response &response, Tie tie) {
  Json report = {{"message", response.message->command},
                 {"response", response.message->response},
                 {"verified", true},
                 {"tied_by", tie_text(tie)},
                 {"payload", response.members}};
  if (!response.status.empty()) report["status"] = response.status;
  if (response.error_code) report["reason"] = reason_json(*response.error_code);
  if (!response.content.is_null()) report["content"] = response.content;
  if (response.dsi_text) report["dsihash"] = dsi_hash_of_text(*response.dsi_text);
  return report;
}

std::string device_lines(const DeviceInfo *device, const Json *dsi) {
  std::string heading = "device";
  if (device != nullptr) {
    heading += " " + printable(device->device_id) + "  TEE key " + device->tee_key.fingerprint();
  }
  if (dsi == nullptr) return heading + "\n`-- state not known: run get-device-state\n";
  return heading + "\n" + dsi_tree(*dsi);
}

Json device_json(const DeviceInfo &device, const Json *dsi) {
  Json report = device_info_json(device);
  report["tee_key_fingerprint"] = device.tee_key.fingerprint();
  if (dsi != nullptr) {
    report["dsihash"] = dsi_hash(*dsi);
    report["dsi"] = dsi->at("dsi");
  }
  return report;
}

}  // namespace tsm
