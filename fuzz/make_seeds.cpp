// SPDX-License-Identifier: BSD-2-Clause
// Plays the exchanges of a TSM with a fresh device, and keeps the device and what was said:
//
//     fuzz_make_seeds FOLDER        writes FOLDER/device.json and FOLDER/corpus/TARGET/*
//
// The messages are signed by keys of that device and its TSM, so all these files are made anew
// together, by the build target fuzz_seeds. Inputs of other names stay: they were written by hand.
#include <filesystem>

#include "common/files.h"
#include "support/manager.h"
#include "support/target_device.h"
#include "tsm/protocol/image.h"
#include "tsm/protocol/jwe.h"

namespace fuzz {

using tsm::Json;
using tsm::MessageId;
using tsm::RequestOptions;

const char kWallet[] = "77a11e7a000000000000000000000001";
const char kTicket[] = "71cce700000000000000000000000002";

struct Seed {
  const char *name;
  MessageId id;
  RequestOptions options;
};

static RequestOptions with_image(RequestOptions options) {
  options.ta_version = "1.0";
  options.image = tsm::pack_image("a trusted application of the bank");
  return options;
}

static const Seed kFirstSteps[] = {
    {"", MessageId::kCreateSd, {.spid = "bank", .sdname = "wallet", .spcert = "a certificate"}},
    {"", MessageId::kCreateSd, {.spid = "bank", .sdname = "cards", .spcert = "a certificate"}},
    {"", MessageId::kCreateSd, {.spid = "rail", .sdname = "tickets", .spcert = "another"}},
    {"", MessageId::kInstallTa, with_image({.spid = "bank", .sdname = "wallet", .taid = kWallet})},
};

static const Seed kSeeds[] = {
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

// A device after its first steps, and its TSM. A new instance lists the SDs in their stored order.
struct Life {
  Life() {
    require(tsm.get_device_state().passed(), "the agent tells its state");
    for (const Seed &step : kFirstSteps) {
      require(tsm.run(step.id, step.options).passed(), "a request of the seeds is carried out");
    }
    require(device.restart() && tsm.get_device_state().passed(), "the agent starts again");
  }

  StoredDevice stored() const {
    return {tsm.tsm(), tsm.dsi_text, device.agent_objects(), device.key_service_objects()};
  }

  TargetDevice device;
  const tsm::Identity identity = admitted(tsm::RsaKey::generate(kKeyBits));
  otrp_test::Manager tsm{device, identity};
};

static std::string g_folder;

static void keep(const std::string &target, const std::string &name, std::string_view bytes) {
  const std::string corpus = g_folder + "/corpus/" + target;
  std::filesystem::create_directories(corpus);
  tools::write_file(corpus + "/" + name, bytes);
}

// What stands in an encrypted content, as the "content" target takes it.
static std::string content_of(const Seed &seed, const StoredDevice &device) {
  if (seed.id == MessageId::kGetDeviceState) return device.tsm.key_chain.dump();
  if (seed.id == MessageId::kGetTaInfo) {
    return tsm::ta_info_request(seed.options.spid, seed.options.taid).dump();
  }
  RequestOptions options = seed.options;
  options.did = device.device_id();
  return tsm::request_content(seed.id, options, device.tsm.tsmid).dump();
}

static void keep_messages(const Life &life, const StoredDevice &device) {
  for (const Seed &seed : kSeeds) {
    const auto id = static_cast<uint32_t>(seed.id);
    const std::string text = life.tsm.request(seed.id, seed.options);
    const std::string content = content_of(seed, device);
    const std::string &image = seed.options.image;
    keep("frame", seed.name, device::build_frame(id, text));
    keep("content", seed.name, std::to_string(id) + content + (image.empty() ? "" : '\0' + image));
    keep("token_reader", seed.name, "tsmid\n" + text);
    keep("json", seed.name, content);
    keep("jwe", seed.name, tsm::jwe_encrypt(device.tee_key(), content).dump());
  }
  const Json gcm = tsm::jwe_encrypt(device.tee_key(), R"({"a":[1,true,"text"]})",
                                    {.cipher = tsm::ContentCipher::kA128Gcm});
  keep("jwe", "gcm", gcm.dump());
  keep("query", "recorded", device::build_query(kWallet));
  keep("query", "unknown", device::build_query(kTicket));
  keep("json", "state-document", device.dsi_text);
  keep("json", "numbers", R"([0,-1,1.5,1e21,-2.5e-7,9007199254740993,true,false,null])");
  keep("base64", "state-document", tsm::base64_encode(device.dsi_text));
}

static void keep_records(const StoredDevice &device) {
  for (const auto &[id, data] : device.agent) {
    const std::string payload = data.substr(4);
    keep("records", id, serialize_objects({{id, data}}));
    keep("json", id, payload);
    const Json record = tsm::parse_json(payload).value_or(nullptr);
    const std::string *aik = tsm::find_string(record, "aik");
    if (aik == nullptr) continue;
    keep("base64", id, *aik);
    keep("tlv", id, tsm::base64_decode(*aik).value());
  }
  keep("records", "all", serialize_objects(device.agent));
}

}  // namespace fuzz

int main(int argc, char **argv) {
  if (argc != 2) {
    std::fprintf(stderr, "usage: fuzz_make_seeds FOLDER\n");
    return 2;
  }
  fuzz::g_folder = argv[1];
  const fuzz::Life life;
  const fuzz::StoredDevice device = life.stored();
  fuzz::write_stored_device(device, fuzz::g_folder + "/device.json");
  keep_messages(life, device);
  keep_records(device);
  return 0;
}
