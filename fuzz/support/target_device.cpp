// SPDX-License-Identifier: BSD-2-Clause
#include "support/target_device.h"

#include <ta_config.h>

#include <algorithm>
#include <cstring>

#include "state/dsi.h"
#include "tsm/protocol/response.h"

// The key service's entry points under names of their own: the agent's are in the same program.
extern "C" {
TEE_Result corvel_create(void);
void corvel_destroy(void);
TEE_Result corvel_open(uint32_t param_types, TEE_Param params[4], void **session_context);
void corvel_close(void *session_context);
TEE_Result corvel_invoke(void *session_context, uint32_t command_id, uint32_t param_types,
                         TEE_Param params[4]);
}

namespace fuzz {
namespace {

constexpr size_t kWordLen = 4;
constexpr size_t kHeaderLen = kWordLen + kWordLen;
constexpr uint32_t kDsiBlocks = 4;  // the structure and its three texts

const TEE_UUID kAgent = TA_UUID;
const TEE_UUID kKeyService = CORVEL_UUID;

// Compares the bytes with themselves one further on: these are long, and looked at in every run.
bool untouched(std::string_view bytes) {
  return bytes.empty() || (static_cast<uint8_t>(bytes.front()) == device::kUntouched &&
                           std::memcmp(bytes.data(), bytes.data() + 1, bytes.size() - 1) == 0);
}

// Where the payload stood there are zeros, up to where it ended.
bool wiped_or_untouched(std::string_view bytes) {
  const size_t end = bytes.find_first_not_of('\0');
  return end == std::string_view::npos || untouched(bytes.substr(end));
}

// An answer that is not well-formed throws, which ends the process.
device::Answer require_answer(const device::Reply &reply) {
  const std::string_view output = reply.output.bytes();
  device::Answer answer = device::parse_answer(output, reply.size);
  const size_t image_len = answer.image ? kWordLen + answer.image->size() : 0;
  const size_t end = kHeaderLen + answer.response.size() + image_len;
  require(wiped_or_untouched(output.substr(end)), "nothing stands behind the answer");
  return answer;
}

// An AIK signs what GetTAInfo answers.
void require_signature(std::string_view response, const tsm::RsaKey &tee_key) {
  const tsm::Envelope envelope = tsm::parse_envelope(response);
  require(envelope.message->id == tsm::MessageId::kGetTaInfo ||
              tsm::signature_verifies(envelope, tee_key),
          "a response's signature verifies");
}

void require_refusal(const device::Reply &reply) {
  const std::string_view output = reply.output.bytes();
  const std::string header =
      tsm::little_endian(reply.result, kWordLen) + tsm::little_endian(0, kWordLen);
  require(reply.size == output.size(), "a refused frame leaves the size");
  require(untouched(output.starts_with(header) ? output.substr(kHeaderLen) : output),
          "a refused frame is answered by its code, or not at all");
}

void require_query_answer(const device::Reply &reply) {
  if (untouched(reply.output.bytes())) return;
  require(reply.result != TEEC_ERROR_SHORT_BUFFER, "nothing is written where it does not fit");
  const device::Answer answer = require_answer(reply);
  require(answer.status == reply.result, "an answer repeats the result");
  require(kHeaderLen + answer.response.size() == reply.size, "an answer's length is right");
  require(answer.response.starts_with(reply.result == TEEC_SUCCESS ? R"({"status":"0",)"
                                                                   : R"({"status":"-1",)"),
          "an answer's text says what its result does");
}

std::string state() {
  return std::string(g_dsi->sdl_json_str) + g_dsi->spl_json_str + g_dsi->tal_json_str;
}

}  // namespace

uint32_t capacity_of(std::string_view frame) {
  if (frame.size() < kWordLen) return kMaxCapacity;
  uint32_t word = 0;
  for (size_t i = kWordLen; i-- > 0;) word = word << 8 | static_cast<uint8_t>(frame[i]);
  return word == 0 ? kMaxCapacity : std::min(word, kMaxCapacity);
}

TargetDevice::TargetDevice() : ClientDevice(name()) {
  register_ta({.uuid = kAgent},
              {TA_CreateEntryPoint, TA_DestroyEntryPoint, TA_OpenSessionEntryPoint,
               TA_CloseSessionEntryPoint, TA_InvokeCommandEntryPoint});
  register_ta({.uuid = kKeyService},
              {corvel_create, corvel_destroy, corvel_open, corvel_close, corvel_invoke});
}

TargetDevice::TargetDevice(const StoredDevice &stored) : TargetDevice() {
  for (const auto &[id, data] : stored.key_service) put_object(kKeyService, id, data);
  first_ = stored.agent;
  store(first_);
  require(open(), "the agent starts");
  first_state_ = state();
  writes_ = durable_writes();
}

bool TargetDevice::open() {
  const bool is_open = ClientDevice::open();
  is_open ? require_clean() : require_clean_failure();
  return is_open;
}

void TargetDevice::require_clean() {
  tee_heap_stats now{};
  require(tee_inspect_stats(door().context(), &device::kAgentUuid, &now) == TEEC_SUCCESS,
          "the instance lives on");
  require(now.live_blocks == kDsiBlocks, "only the state document is left on the heap");
  require(now.open_objects == 0 && now.open_operations == 0 && now.open_sessions == 0,
          "no handle is left open");
}

// The instance is gone, and its heap with it. So the same is tried again from inside.
void TargetDevice::require_clean_failure() {
  const tee::test::InsideTa inside(*this, {.uuid = kAgent});
  require(init_dsi() == nullptr, "what fails fails again");
  const tee_heap_stats now = inside.stats();
  require(now.live_blocks == 0 && now.open_objects == 0 && now.open_operations == 0,
          "a start that fails leaves nothing behind");
}

device::Reply TargetDevice::run(uint32_t command, std::string_view input, uint32_t capacity) {
  device::Reply reply = session().invoke(
      {.command_id = command, .input = device::Buffer(input), .capacity = capacity});
  if (command == kMessageCommand) require_message_answer(reply);
  if (command == kQueryCommand) require_query_answer(reply);
  require_clean();
  log_.clear();
  return reply;
}

void TargetDevice::require_message_answer(const device::Reply &reply) {
  if (reply.result != TEEC_SUCCESS) return require_refusal(reply);
  const device::Answer answer = require_answer(reply);
  require(answer.status != TEE_SUCCESS || !answer.response.empty(), "a success has a response");
  if (answer.response.empty()) return;
  // The key service makes the key when it is first asked.
  if (!tee_key_) tee_key_ = tee_key_of(key_service_objects());
  require_signature(answer.response, *tee_key_);
}

void TargetDevice::store(const Objects &objects) {
  for (const auto &[id, data] : agent_objects()) remove_object(kAgent, id);
  for (const auto &[id, data] : objects) put_object(kAgent, id, data);
}

void TargetDevice::restore() {
  if (durable_writes() == writes_ && state() == first_state_) return;
  close();
  require(open(), "the agent starts with what it has stored");
  close();
  store(first_);
  require(open() && state() == first_state_, "the agent starts as it did at first");
  writes_ = durable_writes();
}

Objects TargetDevice::agent_objects() const {
  return objects(kAgent);
}

Objects TargetDevice::key_service_objects() const {
  return objects(kKeyService);
}

}  // namespace fuzz
