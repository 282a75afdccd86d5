// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/home/home.h"

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
constexpr std::string_view kInventoryFile = "inventory.json";
constexpr std::string_view kTokenFile = "admin-token";
constexpr size_t kTokenLen = 32;  // bytes, before they are text
constexpr size_t kMinTokenTextLen = 16;
constexpr size_t kCaModulusLen = 256;
constexpr size_t kMaxTsmidLen = 55;  // with its prefix it is a storage object ID of 64 bytes

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

/// A key that an unfinished `init` left, if there is one.
std::optional<RsaKey> left_key(const std::string &file) {
  if (!tools::file_exists(file)) return std::nullopt;
  const std::optional<RsaKey> key = RsaKey::from_pem(tools::read_file(file));
  if (!key || !key->has_private_half()) {
    throw UsageError(file + " holds no private key, and no TSM lives here yet: remove it");
  }
  return key;
}

DeviceInfo read_device(const std::string &file) {
  try {
    return parse_device_info(tools::read_file(file));
  } catch (const UsageError &error) {
    throw UsageError(file + ": " + error.what() +
                     "; remove it, the next message to the device writes it anew");
  }
}

}  // namespace

Identity Home::create(std::string_view tsmid, std::string_view ca_pem) const {
  check_tsmid(tsmid);
  const RsaKey ca = parse_ca(ca_pem);
  make_directory(directory_);
  const tools::FileLock lock(path("lock"));
  if (tools::file_exists(path(kIdentityFile))) {
    throw UsageError("a TSM lives in " + directory_ + " already: choose another --home");
  }
  const std::optional<RsaKey> left_ca = left_key(path(kCaFile));
  if (left_ca && left_ca->fingerprint() != ca.fingerprint()) {
    throw UsageError(path(kCaFile) +
                     " is the key of another CA-TSM: remove it, or name it in --ca");
  }
  const std::optional<RsaKey> key = left_key(path(kKeyFile));
  const Identity tsm = admit(tsmid, key ? *key : RsaKey::generate(), ca);

  const Json identity = {{"tsmid", tsm.tsmid}, {"key_chain", tsm.key_chain}};
  tools::write_file(path(kKeyFile), tsm.key.private_pem(), tools::FileAccess::kOwnerOnly);
  tools::write_file(path(kCaFile), tsm.ca->private_pem(), tools::FileAccess::kOwnerOnly);
  tools::write_file(path(kIdentityFile), identity.dump(2) + "\n");  // last: it makes the TSM
  return tsm;
}

void Home::require_identity() const {
  if (!tools::file_exists(path(kIdentityFile))) {
    throw UsageError("no TSM lives in " + directory_ +
                     ": run `otrp-tsm init` first, or name its --home");
  }
}

Identity Home::load_identity() const {
  require_identity();
  const std::optional<Json> identity = parse_json(tools::read_file(path(kIdentityFile)));
  const std::string *tsmid = identity ? find_string(*identity, "tsmid") : nullptr;
  const Json *chain = identity ? find_object(*identity, "key_chain") : nullptr;
  const std::optional<RsaKey> key = RsaKey::from_pem(tools::read_file(path(kKeyFile)));
  if (tsmid == nullptr || chain == nullptr || !key || !key->has_private_half()) {
    throw UsageError("the TSM's files in " + directory_ +
                     " are damaged: expected what `otrp-tsm init` wrote");
  }

  std::optional<RsaKey> ca;
  if (tools::file_exists(path(kCaFile))) ca = RsaKey::from_pem(tools::read_file(path(kCaFile)));
  if (ca && !ca->has_private_half()) ca.reset();
  return {*tsmid, *key, *chain, ca};
}

std::string Home::admin_token() const {
  require_identity();
  const std::string file = path(kTokenFile);
  const tools::FileLock lock(path("lock"));  // servers that start together have the same
  if (!tools::file_exists(file)) {
    tools::write_file(file, base64url_encode(random_bytes(kTokenLen)) + "\n",
                      tools::FileAccess::kOwnerOnly);
  }
  std::string token = tools::read_file(file);
  token.erase(token.find_last_not_of(" \r\n") + 1);
  const bool is_plain = std::ranges::all_of(token, [](char c) { return c > ' ' && c <= '~'; });
  if (token.size() < kMinTokenTextLen || !is_plain) {
    throw UsageError(file +
                     " is no token: expected 16 or more printable ASCII characters; "
                     "remove it, the next `serve --admin` makes one");
  }
  return token;
}

std::string Home::folder_of(const DeviceInfo &device) const {
  return path("devices/" + device.tee_key.fingerprint());
}

Inventory Home::inventory() const {
  require_identity();
  return Inventory(path(kInventoryFile));
}

void Home::change_inventory(const std::function<void(Inventory *)> &change) const {
  require_identity();
  tsm::change_inventory(path(kInventoryFile), change);
}

void Home::forget(const DeviceInfo &device) const {
  const std::string folder = folder_of(device);
  if (!tools::file_exists(folder)) return;
  const tools::FileLock lock(folder + "/lock");  // whoever talks to it comes to an end before
  std::error_code failure;
  fs::remove_all(folder, failure);
  if (failure) throw UsageError("cannot remove " + folder + ": " + failure.message());
}

std::optional<DeviceInfo> Home::find_device(const std::string &fingerprint) const {
  const std::string file = path("devices/" + fingerprint + "/device.json");
  if (!tools::file_exists(file)) return std::nullopt;
  return read_device(file);
}

std::vector<KnownDevice> Home::known_devices() const {
  require_identity();
  std::vector<KnownDevice> known;
  if (!tools::file_exists(path("devices"))) return known;
  std::error_code failure;
  for (fs::directory_iterator entry(path("devices"), failure), end; !failure && entry != end;
       entry.increment(failure)) {
    const std::string folder = entry->path().string();
    const std::string file = folder + "/device.json";
    if (tools::file_exists(file)) known.push_back({read_device(file), folder});
  }
  if (failure) throw UsageError("cannot read " + path("devices") + ": " + failure.message());
  std::ranges::sort(known, {}, [](const KnownDevice &entry) {
    return std::pair(entry.device.device_id, entry.device.tee_key.fingerprint());
  });
  return known;
}

}  // namespace tsm
