// SPDX-License-Identifier: BSD-2-Clause
#include "support/manager.h"

#include <algorithm>
#include <cstdlib>
#include <map>

#include "common/files.h"
#include "support/kept_key.h"
#include "tsm/protocol/dsi.h"
#include "tsm/protocol/image.h"
#include "tsm/protocol/jwe.h"
#include "tsm/protocol/trust.h"

namespace otrp_test {

using tsm::RequestOptions;

std::string environment(const char *name, const std::string &otherwise) {
  const char *value = std::getenv(name);
  return value != nullptr && *value != '\0' ? value : otherwise;
}

const tsm::RsaKey &key_named(const std::string &name) {
  static std::map<std::string, tsm::RsaKey> keys;
  if (!keys.contains(name)) keys.emplace(name, kept_key("key " + name));
  return keys.at(name);
}

const tsm::RsaKey &dev_ca() {
  static const std::string file = environment("OTRP_TEST_CA", OTRP_DEV_CA_TSM_KEY);
  static const tsm::RsaKey key = tsm::RsaKey::from_pem(tools::read_file(file)).value();
  return key;
}

const tsm::Identity &tsm_named(const std::string &tsmid) {
  static std::map<std::string, tsm::Identity> identities;
  if (!identities.contains(tsmid)) {
    identities.emplace(tsmid, tsm::admit(tsmid, kept_key("TSM " + tsmid), dev_ca()));
  }
  return identities.at(tsmid);
}

testing::AssertionResult Outcome::passed() const {
  if (response && response->status != "fail") return testing::AssertionSuccess();
  const bool is_refused = response && response->error_code;
  const device::Origin origin =
      reply.result == TEEC_SUCCESS ? device::Origin::kStatusWord : reply.answer.origin;
  return testing::AssertionFailure()
         << device::Error(message, code(), origin, is_refused ? "error_code of the response" : "")
                .what();
}

uint32_t Outcome::code() const {
  if (response && response->error_code) return *response->error_code;
  return reply.result != TEEC_SUCCESS ? reply.result : reply.status;
}

Edit patch(const Json &changes) {
  return [changes](Json &members) { members.merge_patch(changes); };
}

std::string make_image(size_t payload_len, uint32_t seed) {
  std::string payload(payload_len, 0);
  uint32_t state = seed;
  for (char &byte : payload) {
    state = state * 1664525u + 1013904223u;
    byte = static_cast<char>(state >> 24);
  }
  return tsm::pack_image(payload);
}

std::string taid(const std::string &name) {
  return name + std::string(32 - name.size(), '0');
}

RequestOptions usual(MessageId id) {
  using enum MessageId;
  static const std::string image = make_image(100);
  static const std::string ta1 = taid("ta1");
  static const std::map<MessageId, RequestOptions> all = {
      {kGetDeviceState, {}},
      {kInstallTa,
       {.spid = "sp1", .sdname = "sd2", .taid = taid("ta3"), .ta_version = "1", .image = image}},
      {kUpdateTa, {.spid = "sp1", .sdname = "sd1", .taid = ta1, .ta_version = "2", .image = image}},
      {kDeleteTa, {.sdname = "sd1", .taid = ta1}},
      {kCreateSd, {.spid = "sp3", .sdname = "sd4", .spcert = "certificate"}},
      {kUpdateSd, {.spid = "sp1", .sdname = "sd2", .spcert = "renewed", .renew_aik = true}},
      {kDeleteSd, {.sdname = "sd1", .deleteta = "true"}},
      {kGetTaInfo, {.spid = "sp1", .taid = ta1}},
  };
  return all.at(id);
}

static tsm::DeviceInfo info_of(device::Device &door) {
  const std::string file = environment("OTRP_TEST_DEVICE", "");
  if (!file.empty()) return tsm::parse_device_info(tools::read_file(file));
  const device::Info info = device::read_info(door);
  return {info.device_id, tsm::RsaKey::from_encoded(info.tee_public_key).value()};
}

Manager::Manager(ClientDevice &device, const tsm::Identity &tsm)
    : info(info_of(device.door())), device_(device), tsm_(&tsm) {
  device.require_open();
}

Manager::Manager(ClientDevice &device, const Manager &other)
    : info(other.info),
      capacity(other.capacity),
      dsi_text(other.dsi_text),
      dsi(other.dsi),
      device_(device),
      tsm_(other.tsm_) {}

std::string Manager::dsihash() const {
  return tsm::dsi_hash_of_text(dsi_text);
}

std::string Manager::request(MessageId id, RequestOptions options, const Edits &edits) const {
  const tsm::Message &message = tsm::message_of(id);
  if (id == MessageId::kGetTaInfo) return tsm::make_request(id, options, tsm(), info, &dsi);
  if (options.rid.empty()) options.rid = tsm::random_id();
  if (options.tid.empty()) options.tid = tsm::random_id();
  if (options.dsihash.empty() && id != MessageId::kGetDeviceState) options.dsihash = dsihash();
  if (options.did.empty()) options.did = info.device_id;

  Json content = tsm::request_content(id, options, tsm().tsmid);
  if (edits.content) edits.content(content);
  if (!content.is_null()) content = tsm::jwe_encrypt(info.tee_key, content.dump(), {edits.cipher});
  Json image;
  Json extra = Json::object();
  if (!tsm::image_member(id).empty()) {
    const auto aik = tsm::find_aik(dsi, options.spid);
    image =
        tsm::encrypted_ta(aik.value_or(key_named("no AIK")), options.image, tsm::image_member(id));
    extra["signature2"] = tsm::signature2(dev_ca(), options.tid, options.rid, info.device_id,
                                          options.taid, tsm().tsmid);
  }
  const Json chain = id == MessageId::kGetDeviceState ? tsm().key_chain : Json();
  Json tbs = tsm::tbs_request(message, options, chain, image, content);
  if (edits.tbs) edits.tbs(tbs.front());
  const std::string text = tsm::seal(tbs, message.request, tsm().tsmid, tsm().key, extra);
  if (!edits.envelope) return text;
  Json edited = Json::parse(text);
  edits.envelope(edited.front());
  return edited.dump();
}

Outcome Manager::send(MessageId id, const std::string &text) {
  Outcome outcome = {.message = tsm::message_of(id).command};
  outcome.reply =
      device_.send(static_cast<uint32_t>(id), text, std::max(capacity, 2 * text.size()));
  if (outcome.reply.response.empty()) return outcome;
  outcome.response = tsm::open_response(outcome.reply.response, {info.tee_key, tsm().key, &dsi});
  if (outcome.response->dsi_text) {
    dsi_text = *outcome.response->dsi_text;
    dsi = tsm::parse_json(dsi_text).value();
  }
  return outcome;
}

Outcome Manager::run(MessageId id, const RequestOptions &options, const Edits &edits) {
  return send(id, request(id, options, edits));
}

void Manager::furnish() {
  const bool done = get_device_state().passed() && create_sd("sp1", "sd1").passed() &&
                    create_sd("sp1", "sd2").passed() && create_sd("sp2", "sd3").passed() &&
                    install_ta("sp1", "sd1", taid("ta1")).passed() &&
                    install_ta("sp1", "sd1", taid("ta2")).passed();
  if (!done) throw std::runtime_error("the device cannot be furnished");
}

Outcome Manager::get_device_state() {
  return run(MessageId::kGetDeviceState);
}

Outcome Manager::create_sd(const std::string &spid, const std::string &sdname) {
  return run(MessageId::kCreateSd,
             {.spid = spid, .sdname = sdname, .spcert = "certificate of " + spid});
}

Outcome Manager::install_ta(const std::string &spid, const std::string &sdname,
                            const std::string &ta, const std::string &image) {
  return run(MessageId::kInstallTa,
             {.spid = spid, .sdname = sdname, .taid = ta, .ta_version = "1.0", .image = image});
}

Outcome Manager::update_ta(const std::string &spid, const std::string &sdname,
                           const std::string &ta, const std::string &image) {
  return run(MessageId::kUpdateTa,
             {.spid = spid, .sdname = sdname, .taid = ta, .ta_version = "2.0", .image = image});
}

Outcome Manager::delete_ta(const std::string &sdname, const std::string &ta) {
  return run(MessageId::kDeleteTa, {.sdname = sdname, .taid = ta});
}

Outcome Manager::update_sd(const std::string &spid, const std::string &sdname, bool renew_aik) {
  return run(MessageId::kUpdateSd, {.spid = spid,
                                    .sdname = sdname,
                                    .spcert = "renewed certificate of " + spid,
                                    .renew_aik = renew_aik});
}

Outcome Manager::delete_sd(const std::string &sdname, const std::string &deleteta) {
  return run(MessageId::kDeleteSd, {.sdname = sdname, .deleteta = deleteta});
}

Outcome Manager::get_ta_info(const std::string &spid, const std::string &ta) {
  return run(MessageId::kGetTaInfo, {.spid = spid, .taid = ta});
}

std::vector<std::string> Manager::sd_names() const {
  std::vector<std::string> names;
  for (const Json &sd : sd_list()) names.push_back(sd.at("name").get<std::string>());
  return names;
}

}  // namespace otrp_test
