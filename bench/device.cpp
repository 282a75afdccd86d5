// SPDX-License-Identifier: BSD-2-Clause
#include "device.h"

#include <cstring>
#include <stdexcept>

#include "rivals.h"
#include "tsm/protocol/dsi.h"

namespace bench {

using otrp_test::Json;
using otrp_test::make_image;
using otrp_test::taid;
using otrp_test::word;

namespace {

constexpr size_t kOutputLen = 4 << 20;
constexpr char kNewSd[] = "new";

void require(bool passed, const char *what) {
  if (!passed) throw std::runtime_error(std::string("the device refused to ") + what);
}

void create_sd(Scene &scene) {
  require(scene.create_sd("sp1", kNewSd).passed(), "create an SD");
}

void delete_sd(Scene &scene) {
  require(scene.delete_sd(kNewSd, "true").passed(), "delete an SD");
}

void install_ta(Scene &scene) {
  require(scene.install_ta("sp1", "sd1", taid("new")).passed(), "install a TA");
}

void delete_ta(Scene &scene) {
  require(scene.delete_ta("sd1", taid("new")).passed(), "delete a TA");
}

std::string stored(const Json &record) {
  const std::string text = record.dump();
  return word(static_cast<uint32_t>(text.size())) + text;
}

uint32_t word_at(const char *at) {
  const auto *bytes = reinterpret_cast<const uint8_t *>(at);
  return static_cast<uint32_t>(bytes[0] | bytes[1] << 8 | bytes[2] << 16) | uint32_t{bytes[3]}
                                                                                << 24;
}

std::string numbered(const std::string &prefix, size_t number) {
  const std::string digits = std::to_string(number);
  return prefix + std::string(4 - digits.size(), '0') + digits;
}

}  // namespace

std::vector<MessageCase> message_cases(size_t image_len) {
  const std::string image = make_image(image_len);
  return {
      {"GetDeviceState", MessageId::kGetDeviceState, {}},
      {"CreateSD",
       MessageId::kCreateSd,
       {.spid = "sp1", .sdname = kNewSd, .spcert = "certificate of sp1"},
       nullptr,
       delete_sd},
      {"UpdateSD", MessageId::kUpdateSd, {.spid = "sp1", .sdname = "sd1", .renew_aik = false}},
      {"DeleteSD", MessageId::kDeleteSd, {.sdname = kNewSd, .deleteta = "true"}, create_sd},
      {"InstallTA",
       MessageId::kInstallTa,
       {.spid = "sp1", .sdname = "sd1", .taid = taid("new"), .ta_version = "1.0", .image = image},
       nullptr,
       delete_ta},
      {"UpdateTA",
       MessageId::kUpdateTa,
       {.spid = "sp1", .sdname = "sd1", .taid = taid("ta1"), .ta_version = "2.0", .image = image}},
      {"DeleteTA", MessageId::kDeleteTa, {.sdname = "sd1", .taid = taid("new")}, install_ta},
      {"GetTAInfo", MessageId::kGetTaInfo, {.spid = "sp1", .taid = taid("ta1")}},
  };
}

MessageCase message_case(MessageId id, size_t image_len) {
  for (MessageCase &message : message_cases(image_len)) {
    if (message.id == id) return message;
  }
  throw std::logic_error("no such message");
}

// ---- Devices

void make_first_sd(Scene &scene) {
  if (!scene.get_device_state().response) require(false, "tell its state");
  require(scene.create_sd("sp1", "sd1").passed(), "create an SD");
  require(scene.install_ta("sp1", "sd1", taid("ta1")).passed(), "install a TA");
  require(scene.install_ta("sp1", "sd1", taid("ta2")).passed(), "install a TA");
}

Snapshot filled(const Snapshot &first, size_t num_sds) {
  Snapshot snapshot = first;
  const Json sd1 = Json::parse(first.agent.at("SD_INFO_sd1").substr(4));
  Json list = Json::parse(first.agent.at("SD_LIST_ID").substr(4));
  for (size_t i = 1; i < num_sds; ++i) {
    Json record = sd1;
    record["name"] = numbered("domain", i);
    list["sd_list"].push_back(record["name"]);
    for (Json &ta : record["talist"]) {
      ta["taid"] = ta["taname"] =
          taid(ta["taid"].get<std::string>().substr(0, 3) + numbered("", i));
    }
    snapshot.agent["SD_INFO_" + record["name"].get<std::string>()] = stored(record);
  }
  snapshot.agent["SD_LIST_ID"] = stored(list);
  return snapshot;
}

std::shared_ptr<Scene> start(const Scene &first, const Snapshot &snapshot) {
  const auto scene = std::make_shared<Scene>(first, snapshot);
  scene->capacity = kOutputLen;
  const bool started =
      scene->device.open() && Exchange(scene, message_case(MessageId::kGetDeviceState)).try_once();
  return started ? scene : nullptr;
}

// A key's numbers decide by some microseconds how long it takes to complete it: what a device is
// compared with works with the same ones.
static void give_key(const tsm::RsaKey &key, Scene *scene, Snapshot *snapshot) {
  constexpr size_t kDeviceIdLen = 32;
  const RsaNumbers numbers = numbers_of(key, false);
  std::string &identity = snapshot->key_service.at("IDENTITY");
  identity = identity.substr(0, kDeviceIdLen) + otrp_test::box_record(0x11, numbers.n) +
             otrp_test::box_record(0x12, numbers.e) + otrp_test::box_record(0x13, numbers.d);
  scene->info.tee_key = key;
}

std::shared_ptr<Scene> filled_device(size_t num_sds) {
  Scene first;
  make_first_sd(first);
  Snapshot snapshot = filled(first.device.snapshot(), num_sds);
  give_key(otrp_test::key_named("floor"), &first, &snapshot);
  const auto scene = start(first, snapshot);
  require(scene != nullptr, "start");
  return scene;
}

// ---- Exchanges

Exchange::Exchange(std::shared_ptr<Scene> scene, MessageCase message)
    : scene_(std::move(scene)),
      message_(std::move(message)),
      session_(scene_->device.door(), device::kAgentUuid),
      output_(kOutputLen) {}

void Exchange::before() {
  if (message_.arrange != nullptr) message_.arrange(*scene_);
  request_ = scene_->request(message_.id, message_.options);
  frame_ = otrp_test::frame(static_cast<uint32_t>(message_.id), request_);
  operation_ = {};
  operation_.paramTypes = device::kMessageTypes;
  operation_.params[0].tmpref = {frame_.data(), frame_.size()};
  operation_.params[1].tmpref = {output_.data(), output_.size()};
}

void Exchange::run() {
  device::Origin origin{};
  result_ = session_.invoke(0, operation_, origin);
}

bool Exchange::read_answer() {
  if (result_ != TEEC_SUCCESS || word_at(output_.data()) != 0) return false;
  const tsm::ResponseKeys keys = {scene_->info.tee_key, scene_->tsm().key, &scene_->dsi};
  response_.assign(output_.data() + 8, word_at(output_.data() + 4));
  const tsm::Response response = tsm::open_response(response_, keys);
  if (response.status == "fail") return false;
  if (response.dsi_text) {
    scene_->dsi_text = *response.dsi_text;
    scene_->dsi = tsm::parse_json(scene_->dsi_text).value();
  }
  return true;
}

void Exchange::after() {
  if (!read_answer()) throw std::runtime_error(message_.name + " was not carried out");
  if (message_.restore != nullptr) message_.restore(*scene_);
}

bool Exchange::try_once() {
  before();
  run();
  return read_answer();
}

Contestant contestant(const std::string &name, const std::shared_ptr<Exchange> &exchange) {
  return {name, [exchange] { exchange->run(); }, [exchange] { exchange->before(); },
          [exchange] { exchange->after(); }};
}

}  // namespace bench
