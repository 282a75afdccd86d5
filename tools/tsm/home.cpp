// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/home.h"

#include <algorithm>
#include <filesystem>

#include "common/files.h"

namespace tsm {
namespace {

namespace fs = std::filesystem;
using tools::UsageError;

constexpr std::string_view kIdentityFile = "tsm.json";
constexpr std::string_view kKeyFile = "tsm-key.pem";
constexpr std::string_view kCaFile = "ca-tsm.pem";
constexpr size_t kCaModulusLen = 256;
constexpr size_t kMaxTsmidLen = 55;  // with its prefix it is a storage object ID of 64 bytes

bool exists(const std::string &path) {
  std::error_code ignored;
  return fs::exists(path, ignored);
}

void make_directory(const std::string &path) {
  std::error_code failure;
  const bool is_new = fs::create_directories(path, failure);
  if (!failure && is_new) fs::permissions(path, fs::perms::owner_all, failure);
  if (failure) throw UsageError("cannot make directory " + path + ": " + failure.message());
}

/// The device compares a tsmid as it stands in a JSON text, so it must need no escapes there.
void check_tsmid(std::string_view tsmid) {
  const bool is_plain = std::ranges::all_of(
      tsmid, [](char c) { return c > ' ' && c <= '~' && c != '"' && c != '\\'; });
  if (tsmid.empty() || tsmid.size() > kMaxTsmidLen || !is_plain) {
    throw UsageError("bad TSM ID: expected 1 to 55 printable ASCII characters, no space, \" or \\");
  }
}

RsaKey parse_ca(std::string_view pem) {
  const std::optional<RsaKey> ca = RsaKey::from_pem(pem);
  if (!ca || ca->modulus_len() != kCaModulusLen) {
    throw UsageError("bad CA-TSM key: expected a PEM file with a 2048-bit RSA private key");
  }
  if (!ca->has_private_half()) {
    throw UsageError(
        "the CA-TSM file holds only the public key: expected the private key, which signs this "
        "TSM's entry in the key chain");
  }
  return *ca;
}

}  // namespace

Identity Home::create(std::string_view tsmid, std::string_view ca_pem) const {
  check_tsmid(tsmid);
  for (const std::string_view file : {kIdentityFile, kKeyFile, kCaFile}) {
    if (exists(path(file))) {
      throw UsageError("a TSM lives in " + directory_ + " already (" + std::string(file) +
                       "): choose another --home");
    }
  }
  const Identity tsm = make_identity(tsmid, parse_ca(ca_pem));

  make_directory(directory_);
  const Json identity = {{"tsmid", tsm.tsmid}, {"key_chain", tsm.key_chain}};
  tools::write_file(path(kKeyFile), tsm.key.private_pem(), tools::FileAccess::kOwnerOnly);
  tools::write_file(path(kCaFile), tsm.ca->private_pem(), tools::FileAccess::kOwnerOnly);
  tools::write_file(path(kIdentityFile), identity.dump(2) + "\n");
  return tsm;
}

Identity Home::load_identity() const {
  if (!exists(path(kIdentityFile))) {
    throw UsageError("no TSM lives in " + directory_ +
                     ": run `otrp-tsm init` first, or name its --home");
  }
  const std::optional<Json> identity = parse_json(tools::read_file(path(kIdentityFile)));
  const std::string *tsmid = identity ? find_string(*identity, "tsmid") : nullptr;
  const Json *chain = identity ? find_object(*identity, "key_chain") : nullptr;
  const std::optional<RsaKey> key = RsaKey::from_pem(tools::read_file(path(kKeyFile)));
  if (tsmid == nullptr || chain == nullptr || !key || !key->has_private_half()) {
    throw UsageError("the TSM's files in " + directory_ +
                     " are damaged: expected what `otrp-tsm init` wrote");
  }

  std::optional<RsaKey> ca;
  if (exists(path(kCaFile))) ca = RsaKey::from_pem(tools::read_file(path(kCaFile)));
  if (ca && !ca->has_private_half()) ca.reset();
  return {*tsmid, *key, *chain, ca};
}

std::string Home::device_path(const DeviceInfo &device) const {
  return path("devices/" + device.tee_key.fingerprint());
}

std::optional<std::string> Home::load_dsi(const DeviceInfo &device) const {
  const std::string file = device_path(device) + "/dsi.json";
  if (!exists(file)) return std::nullopt;
  return tools::read_file(file);
}

void Home::keep_dsi(const DeviceInfo &device, std::string_view dsi_text) const {
  const std::string directory = device_path(device);
  make_directory(path("devices"));
  make_directory(directory);
  tools::write_file(directory + "/device.json", device_info_json(device).dump(2) + "\n");
  tools::write_file(directory + "/dsi.json", dsi_text);
}

std::vector<KnownDevice> Home::known_devices() const {
  std::vector<KnownDevice> known;
  std::error_code failure;
  for (const fs::directory_entry &entry : fs::directory_iterator(path("devices"), failure)) {
    const std::string file = entry.path().string() + "/device.json";
    if (!exists(file)) continue;
    const DeviceInfo device = parse_device_info(tools::read_file(file));
    known.push_back({device, load_dsi(device)});
  }
  std::ranges::sort(known, {}, [](const KnownDevice &entry) {
    return std::pair(entry.device.device_id, entry.device.tee_key.fingerprint());
  });
  return known;
}

}  // namespace tsm
