// SPDX-License-Identifier: BSD-2-Clause
#include "support/scene.h"

#include <gtest/gtest.h>

#include "common/files.h"
#include "tsm/dsi.h"
#include "tsm/image.h"
#include "tsm/jwe.h"
#include "tsm/trust.h"

namespace otrp_test {

using tsm::RequestOptions;

const tsm::RsaKey &key_named(const std::string &name) {
  static std::map<std::string, tsm::RsaKey> keys;
  const auto found = keys.find(name);
  if (found != keys.end()) return found->second;
  return keys.emplace(name, tsm::RsaKey::generate()).first->second;
}

const tsm::RsaKey &dev_ca() {
  static const tsm::RsaKey key =
      tsm::RsaKey::from_pem(tools::read_file(OTRP_DEV_CA_TSM_KEY)).value();
  return key;
}

const tsm::Identity &tsm_named(const std::string &tsmid) {
  static std::map<std::string, tsm::Identity> identities;
  const auto found = identities.find(tsmid);
  if (found != identities.end()) return found->second;
  return identities.emplace(tsmid, tsm::make_identity(tsmid, dev_ca())).first->second;
}

uint32_t Outcome::code() const {
  if (response && response->error_code) return *response->error_code;
  return reply.result != TEEC_SUCCESS ? reply.result : reply.status;
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

static tsm::DeviceInfo info_of(device::Device &door) {
  const device::Info info = device::read_info(door);
  return {info.device_id, tsm::RsaKey::from_encoded(info.tee_public_key).value()};
}

Scene::Scene(const std::string &tsmid) : info(info_of(device.door())), tsm_(&tsm_named(tsmid)) {
  EXPECT_TRUE(device.open());
}

Scene::Scene(const std::string &tsmid, const std::string &state_directory)
    : device(state_directory), info(info_of(device.door())), tsm_(&tsm_named(tsmid)) {
  EXPECT_TRUE(device.open());
}

Scene::Scene(const Scene &other, const Snapshot &snapshot)
    : device(snapshot),
      info(other.info),
      dsi_text(other.dsi_text),
      dsi(other.dsi),
      tsm_(other.tsm_) {}

std::string Scene::dsihash() const {
  return tsm::dsi_hash_of_text(dsi_text);
}

std::string Scene::request(MessageId id, RequestOptions options, const Edits &edits) const {
  const tsm::Message &message = tsm::message_of(id);
  if (id == MessageId::kGetTaInfo) {
    Json tbs = tsm::ta_info_request(options.spid, options.taid);
    if (edits.tbs) edits.tbs(tbs);
    return tsm::serialize_as_device(tbs);
  }
  if (options.rid.empty()) options.rid = tsm::random_id();
  if (options.tid.empty()) options.tid = tsm::random_id();
  if (options.dsihash.empty() && id != MessageId::kGetDeviceState) options.dsihash = dsihash();
  if (options.did.empty()) options.did = info.device_id;

  Json content = tsm::request_content(id, options, tsm().tsmid);
  if (edits.content) edits.content(content);
  const Json sealed_content =
      content.is_null() ? Json() : tsm::jwe_encrypt(info.tee_key, content.dump());
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
  Json tbs = tsm::tbs_request(message, options, chain, image, sealed_content);
  if (edits.tbs) edits.tbs(tbs);
  if (edits.extra) edits.extra(extra);
  return tsm::seal(tbs, message.request, tsm().tsmid, tsm().key, extra);
}

Outcome Scene::send(MessageId id, const std::string &text) {
  Outcome outcome;
  outcome.reply = device.send(static_cast<uint32_t>(id), text);
  if (outcome.reply.response.empty()) return outcome;
  outcome.response = tsm::open_response(outcome.reply.response, {info.tee_key, tsm().key, &dsi});
  if (outcome.response->dsi_text) {
    dsi_text = *outcome.response->dsi_text;
    dsi = tsm::parse_json(dsi_text).value();
  }
  return outcome;
}

Outcome Scene::run(MessageId id, const RequestOptions &options, const Edits &edits) {
  return send(id, request(id, options, edits));
}

Outcome Scene::get_device_state() {
  return run(MessageId::kGetDeviceState);
}

Outcome Scene::create_sd(const std::string &spid, const std::string &sdname) {
  return run(MessageId::kCreateSd,
             {.spid = spid, .sdname = sdname, .spcert = "certificate of " + spid});
}

Outcome Scene::install_ta(const std::string &spid, const std::string &sdname, const std::string &ta,
                          const std::string &image) {
  return run(MessageId::kInstallTa,
             {.spid = spid, .sdname = sdname, .taid = ta, .ta_version = "1.0", .image = image});
}

Outcome Scene::update_ta(const std::string &spid, const std::string &sdname, const std::string &ta,
                         const std::string &image) {
  return run(MessageId::kUpdateTa,
             {.spid = spid, .sdname = sdname, .taid = ta, .ta_version = "2.0", .image = image});
}

Outcome Scene::delete_ta(const std::string &sdname, const std::string &ta) {
  return run(MessageId::kDeleteTa, {.sdname = sdname, .taid = ta});
}

Outcome Scene::update_sd(const std::string &spid, const std::string &sdname, bool renew_aik) {
  return run(MessageId::kUpdateSd, {.spid = spid,
                                    .sdname = sdname,
                                    .spcert = "renewed certificate of " + spid,
                                    .renew_aik = renew_aik});
}

Outcome Scene::delete_sd(const std::string &sdname, const std::string &deleteta) {
  return run(MessageId::kDeleteSd, {.sdname = sdname, .deleteta = deleteta});
}

Outcome Scene::get_ta_info(const std::string &spid, const std::string &ta) {
  return run(MessageId::kGetTaInfo, {.spid = spid, .taid = ta});
}

std::vector<std::string> Scene::sd_names() const {
  std::vector<std::string> names;
  for (const Json &sd : dsi.at("dsi").at("tee").at("sdlist").at("sd")) {
    names.push_back(sd.at("name").get<std::string>());
  }
  return names;
}

}  // namespace otrp_test
