// SPDX-License-Identifier: BSD-2-Clause
// write_examples FOLDER: makes the exchanges of docs/examples anew, with a new device and TSM.
#include <cstdio>
#include <filesystem>

#include "common/files.h"
#include "e2e/examples.h"

namespace otrp_test {

static Json as_json(const std::map<std::string, std::string> &objects) {
  Json json = Json::object();
  for (const auto &[id, data] : objects) json[id] = tools::base64_encode(data);
  return json;
}

static void write_json(const std::string &file, const Json &json) {
  tools::write_file(file, json.dump(2) + "\n");
}

/// The TEE key of the key service's record: the device ID, and a key box.
static Json tee_key_of(const std::string &identity) {
  Json key = {{"kty", "RSA"}};
  for (const auto &[type, value] : box_records(identity.substr(32))) {
    key[type == 0x11 ? "n" : type == 0x12 ? "e" : "d"] = tools::base64url_encode(value);
  }
  return key;
}

static void write_examples(const std::string &folder) {
  std::filesystem::create_directories(folder);
  Scene scene;
  const tsm::Identity &tsm = scene.tsm();
  write_json(folder + "/keys.json",
             {{"tsmid", tsm.tsmid},
              {"tsm_key", tsm.key.private_pem()},
              {"device_id", scene.info.device_id},
              {"tee_public_key", tools::base64url_encode(scene.info.tee_key.encoded())},
              {"tee_key", tee_key_of(scene.device.snapshot().key_service.at("IDENTITY"))},
              {"key_service", as_json(scene.device.snapshot().key_service)}});
  for (const Step &step : kSteps) {
    const Json before = as_json(scene.device.objects());
    const std::string request = scene.request(step.id, step.options);
    const std::string dsi = scene.dsi_text;
    const Outcome outcome = scene.send(step.id, request);
    if (!outcome.response) throw std::runtime_error(outcome.passed().message());
    write_json(file_of(folder, step.id), {{"request", Json::parse(request)},
                                          {"response", Json::parse(outcome.reply.response)},
                                          {"device_state_before", dsi},
                                          {"objects_before", before}});
  }
}

}  // namespace otrp_test

int main(int argc, char **argv) {
  if (argc != 2) {
    std::fprintf(stderr, "write_examples: one argument is expected, the folder\n");
    return 2;
  }
  otrp_test::write_examples(argv[1]);
}
