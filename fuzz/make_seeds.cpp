// SPDX-License-Identifier: BSD-2-Clause
// Plays the exchanges of a TSM with a fresh device, and keeps the device and what was said:
//
//     fuzz_make_seeds FOLDER        writes FOLDER/device.json and FOLDER/corpus/TARGET/*
//
// The messages are signed by keys of that device and its TSM, so all files are made anew together,
// by the build target fuzz_seeds.
#include <cstdio>
#include <filesystem>

#include "common/files.h"
#include "support/record_list.h"
#include "support/require.h"
#include "support/target_device.h"
#include "tsm/dsi.h"
#include "tsm/image.h"
#include "tsm/jwe.h"
#include "tsm/request.h"
#include "tsm/response.h"
#include "tsm/trust.h"

namespace {

using fuzz::StoredDevice;
using fuzz::TargetDevice;
using tsm::Json;
using tsm::MessageId;
using tsm::RequestOptions;

const char kWallet[] = "77a11e7a000000000000000000000001";
const char kTicket[] = "71cce700000000000000000000000002";

class Folder {
 public:
  explicit Folder(const std::string &path) : path_(path) {
    std::filesystem::remove_all(path + "/corpus");
  }

  void keep(const std::string &target, const std::string &name, std::string_view bytes) const {
    const std::string folder = path_ + "/corpus/" + target;
    std::filesystem::create_directories(folder);
    tools::write_file(folder + "/" + name, bytes);
  }
  void keep(const StoredDevice &device) const {
    fuzz::write_stored_device(device, path_ + "/device.json");
  }

 private:
  std::string path_;
};

// A TSM and its device while they talk.
class Life {
 public:
  Life() : tsm_(fuzz::admitted("tsm1", tsm::RsaKey::generate(fuzz::kKeyBits))) {
    const device::Info info = device::read_info(target_.door());
    device_id_ = info.device_id;
    tee_key_ = tsm::RsaKey::from_encoded(info.tee_public_key);
    restart();
  }

  std::string request(MessageId id, RequestOptions options) const {
    options.dsihash = dsi_text_.empty() ? "" : tsm::dsi_hash_of_text(dsi_text_);
    const Json dsi = dsi_text_.empty() ? Json() : tsm::parse_json(dsi_text_).value();
    return tsm::make_request(id, options, tsm_, {device_id_, *tee_key_}, &dsi);
  }

  void run(MessageId id, const RequestOptions &options) {
    const std::string frame = device::build_frame(static_cast<uint32_t>(id), request(id, options));
    const device::Reply reply = target_.run(fuzz::kMessageCommand, frame);
    const device::Answer answer = device::parse_answer(reply.output.bytes(), reply.size);
    const Json dsi = dsi_text_.empty() ? Json() : tsm::parse_json(dsi_text_).value();
    const tsm::Response response = tsm::open_response(answer.response, {*tee_key_, tsm_.key, &dsi});
    fuzz::require(response.status != "fail", "a request of the seeds is carried out");
    if (response.dsi_text) dsi_text_ = *response.dsi_text;
  }

  /// A new instance lists the security domains in their stored order.
  void restart() {
    target_.close();
    fuzz::require(target_.open(), "the agent starts");
    dsi_text_.clear();
    run(MessageId::kGetDeviceState, {});
  }

  StoredDevice stored() const {
    return {tsm_, dsi_text_, target_.agent_objects(), target_.key_service_objects()};
  }

 private:
  TargetDevice target_{{}, {}};
  tsm::Identity tsm_;
  std::string device_id_;
  std::optional<tsm::RsaKey> tee_key_;
  std::string dsi_text_;
};

struct Seed {
  const char *name;
  MessageId id;
  RequestOptions options;
};

RequestOptions with_image(RequestOptions options) {
  options.ta_version = "1.0";
  options.image = tsm::pack_image("a trusted application of the bank");
  return options;
}

std::vector<Seed> seeds() {
  return {
      {"get-device-state", MessageId::kGetDeviceState, {}},
      {"install-ta", MessageId::kInstallTa,
       with_image({.spid = "bank", .sdname = "cards", .taid = kTicket})},
      {"update-ta", MessageId::kUpdateTa,
       with_image({.spid = "bank", .sdname = "wallet", .taid = kWallet})},
      {"delete-ta", MessageId::kDeleteTa, {.sdname = "wallet", .taid = kWallet}},
      {"create-sd", MessageId::kCreateSd, {.spid = "bank", .sdname = "loans", .spcert = "cert"}},
      {"create-sd-new-sp", MessageId::kCreateSd, {.spid = "shop", .sdname = "pay", .spcert = "c"}},
      {"update-sd",
       MessageId::kUpdateSd,
       {.spid = "bank", .sdname = "wallet", .spcert = "new", .renew_aik = true}},
      {"update-sd-nothing", MessageId::kUpdateSd, {.spid = "rail", .sdname = "tickets"}},
      {"delete-sd", MessageId::kDeleteSd, {.sdname = "wallet", .deleteta = "true"}},
      {"delete-last-sd", MessageId::kDeleteSd, {.sdname = "tickets", .deleteta = "false"}},
      {"get-ta-info", MessageId::kGetTaInfo, {.spid = "bank", .taid = kWallet}},
      {"delete-sd-unknown", MessageId::kDeleteSd, {.sdname = "none", .deleteta = "true"}},
      {"get-ta-info-unknown", MessageId::kGetTaInfo, {.spid = "bank", .taid = kTicket}},
  };
}

void settle(Life *life) {
  life->run(MessageId::kCreateSd, {.spid = "bank", .sdname = "wallet", .spcert = "a certificate"});
  life->run(MessageId::kCreateSd, {.spid = "bank", .sdname = "cards", .spcert = "a certificate"});
  life->run(MessageId::kCreateSd, {.spid = "rail", .sdname = "tickets", .spcert = "another"});
  life->run(MessageId::kInstallTa,
            with_image({.spid = "bank", .sdname = "wallet", .taid = kWallet}));
  life->restart();
}

// What stands in an encrypted content, as the "content" target takes it.
std::string content_of(const Seed &seed, const StoredDevice &device) {
  if (seed.id == MessageId::kGetDeviceState) return device.tsm.key_chain.dump();
  if (seed.id == MessageId::kGetTaInfo) {
    return tsm::ta_info_request(seed.options.spid, seed.options.taid).dump();
  }
  RequestOptions options = seed.options;
  options.did = device.device_id();
  const std::string content = tsm::request_content(seed.id, options, device.tsm.tsmid).dump();
  return options.image.empty() ? content : content + '\0' + options.image;
}

void keep_messages(const Folder &folder, const Life &life, const StoredDevice &device) {
  for (const Seed &seed : seeds()) {
    const auto id = static_cast<uint32_t>(seed.id);
    const std::string text = life.request(seed.id, seed.options);
    const std::string content = content_of(seed, device);
    folder.keep("frame", seed.name, device::build_frame(id, text));
    folder.keep("content", seed.name, std::to_string(id) + content);
    folder.keep("token_reader", seed.name, "tsmid\n" + text);
    folder.keep("json", seed.name, content.substr(0, content.find('\0')) + '\0' + "edits");
    folder.keep("jwe", seed.name, tsm::jwe_encrypt(device.tsm.key, content).dump());
  }
  folder.keep("jwe", "gcm",
              tsm::jwe_encrypt(device.tsm.key, R"({"a":[1,true,"text"]})",
                               {.cipher = tsm::ContentCipher::kA128Gcm})
                  .dump());
  folder.keep("query", "recorded", device::build_query(kWallet));
  folder.keep("query", "unknown", device::build_query(kTicket));
  folder.keep("json", "state-document", device.dsi_text);
  folder.keep("json", "numbers", R"([0,-1,1.5,1e21,-2.5e-7,9007199254740993,true,false,null])");
  folder.keep("base64", "state-document", tsm::base64_encode(device.dsi_text));
}

void keep_records(const Folder &folder, const StoredDevice &device) {
  std::vector<fuzz::StoredRecord> all;
  for (const auto &[id, data] : device.agent) {
    const std::string payload = data.substr(4);
    all.push_back({id, data});
    folder.keep("records", id, fuzz::serialize_records({{id, data}}));
    folder.keep("json", id, payload);
    const std::optional<Json> record = tsm::parse_json(payload);
    const std::string *aik = record ? tsm::find_string(*record, "aik") : nullptr;
    if (aik == nullptr) continue;
    folder.keep("base64", id, *aik);
    folder.keep("tlv", id, tsm::base64_decode(*aik).value());
  }
  folder.keep("records", "all", fuzz::serialize_records(all));
}

}  // namespace

int main(int argc, char **argv) {
  if (argc != 2) {
    std::fprintf(stderr, "usage: fuzz_make_seeds FOLDER\n");
    return 2;
  }
  const Folder folder(argv[1]);
  Life life;
  settle(&life);
  const StoredDevice device = life.stored();
  folder.keep(device);
  keep_messages(folder, life, device);
  keep_records(folder, device);
  return 0;
}
