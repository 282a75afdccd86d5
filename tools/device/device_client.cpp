// SPDX-License-Identifier: BSD-2-Clause
#include "device/device_client.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <limits>
#include <nlohmann/json.hpp>

#include "common/agent_codes.h"
#include "common/encoding.h"
#include "common/error_line.h"
#include "common/result_names.h"
#include "device/inspect.h"
#include "device_config.h"

namespace device {
namespace {

constexpr uint32_t kPublicIdentityCommand = 0x100;  // of the key service

constexpr size_t kWordLen = 4;
constexpr uint32_t kImageDidNotFit = OTRP_NO_MEMORY;  // as a status beside a response

constexpr uint32_t kQueryCapacity = 256;  // answers are texts of about 50 characters
constexpr uint32_t kDeviceIdCapacity = 256;
constexpr size_t kPublicKeyCapacity = 1024;

const char *origin_text(Origin origin) {
  switch (origin) {
    case Origin::kClientApi:
      return "result of the client API";
    case Origin::kCommunication:
      return "result of the communication with the TEE";
    case Origin::kTee:
      return "result of the TEE";
    case Origin::kTrustedApp:
      return "result of the trusted application";
    case Origin::kStatusWord:
      return "status word in the trusted application's answer";
    case Origin::kAnswer:
      return "malformed answer of the trusted application";
  }
  return "result of unknown origin";
}

std::string named_code(TEEC_Result code, const tools::ResultName *result) {
  const std::string number = tools::code_text(code);
  return result == nullptr ? number : number + " (" + result->name + ")";
}

/// The TEE knows more of its own failures than their codes; codes of others have hints. What the
/// agent says is not there is something else than what a TEE or its Client API does.
std::string explanation(const tools::ResultName *result, Origin origin) {
  const bool is_of_tee =
      origin == Origin::kClientApi || origin == Origin::kCommunication || origin == Origin::kTee;
  const std::string reason = is_of_tee && inspection() ? inspection()->last_error() : "";
  if (reason.empty() && is_of_tee && result != nullptr &&
      result->code == TEEC_ERROR_ITEM_NOT_FOUND) {
    return "there is no TEE of this name, or it has no such trusted application";
  }
  return reason.empty() && result != nullptr ? tools::advice(*result) : reason;
}

std::string error_text(std::string_view action, TEEC_Result code, Origin origin,
                       std::string_view detail) {
  const tools::ResultName *result = tools::find_result(code);
  const std::string why = detail.empty() ? explanation(result, origin) : std::string(detail);
  return std::string(action) + ": " + named_code(code, result) + ", " + origin_text(origin) +
         (why.empty() ? "" : ": ") + why;
}

Error malformed(std::string_view detail) {
  return Error("cannot read the answer", TEEC_ERROR_BAD_FORMAT, Origin::kAnswer, detail);
}

/// Reads a frame front to back; whoever asks for more than is left gets nothing.
class Reader {
 public:
  explicit Reader(std::string_view bytes) : left_(bytes) {}

  std::optional<std::string_view> take(size_t len) {
    if (len > left_.size()) return std::nullopt;
    const std::string_view bytes = left_.substr(0, len);
    left_.remove_prefix(len);
    return bytes;
  }

  std::optional<uint32_t> take_word() {
    const std::optional<std::string_view> bytes = take(kWordLen);
    if (!bytes) return std::nullopt;
    uint32_t word = 0;
    for (size_t i = kWordLen; i-- > 0;) word = word << 8 | static_cast<uint8_t>((*bytes)[i]);
    return word;
  }

  std::optional<std::string_view> take_block() {
    const std::optional<uint32_t> len = take_word();
    return len ? take(*len) : std::nullopt;
  }

  size_t num_left() const { return left_.size(); }

 private:
  std::string_view left_;
};

std::string word(size_t value) {
  return tools::little_endian(value, kWordLen);
}

std::string block(std::string_view bytes) {
  return word(bytes.size()) + std::string(bytes);
}

bool is_temporary_memory(uint16_t types, int parameter) {
  const uint32_t type = types >> (4 * parameter) & 0xF;
  return type == TEEC_MEMREF_TEMP_INPUT || type == TEEC_MEMREF_TEMP_OUTPUT ||
         type == TEEC_MEMREF_TEMP_INOUT;
}

TEEC_TempMemoryReference reference(Buffer &buffer) {
  return {buffer.data(), buffer.size()};
}

/// What the trusted application wrote, when it says that this fits.
std::string written(const Buffer &buffer, size_t size) {
  if (size > buffer.size()) throw malformed("its size exceeds the buffer");
  return std::string(buffer.bytes().substr(0, size));
}

/// An agent without memory for a request reports whatever step comes to notice.
bool may_lack_memory(const Answer &answer) {
  constexpr size_t kLarge = 1 << 20;  // no request without a TA image comes near
  return answer.request_len > kLarge &&
         (answer.status == OTRP_BAD_REQUEST || answer.status == OTRP_NO_MEMORY ||
          answer.status == TEEC_ERROR_OUT_OF_MEMORY);
}

/// What a failure has to do with sizes; empty when nothing.
std::string size_detail(const Answer &answer) {
  if (answer.needed_capacity != 0) {
    return "the device did what was asked, but the TA image did not fit: the answer takes a "
           "capacity of " +
           std::to_string(answer.needed_capacity) + " bytes";
  }
  if (!may_lack_memory(answer)) return "";
  return "the TA image is too large for the agent's memory, unless the request is bad in another "
         "way: it has " +
         std::to_string(answer.request_len) + " bytes; send a smaller image";
}

}  // namespace

const TEEC_UUID kAgentUuid = OTRP_AGENT_UUID;
const TEEC_UUID kKeyServiceUuid = DEVICE_KEY_SERVICE_UUID;

Error::Error(std::string_view action, TEEC_Result code, Origin origin, std::string_view detail)
    : std::runtime_error(error_text(action, code, origin, detail)), code_(code), origin_(origin) {}

// Pages of zeros take no memory before something is written to them.
Buffer::Buffer(size_t size, uint8_t fill)
    : bytes_(static_cast<uint8_t *>(calloc(std::max<size_t>(size, 1), 1))), size_(size) {
  if (!bytes_) throw std::bad_alloc();
  if (fill != 0) std::fill_n(bytes_.get(), size, fill);
}

Buffer::Buffer(std::string_view bytes) : Buffer(bytes.size(), 0) {
  std::copy(bytes.begin(), bytes.end(), bytes_.get());
}

std::string_view Buffer::bytes() const {
  return {reinterpret_cast<const char *>(bytes_.get()), size_};
}

Device::Device(const std::string &name) {
  const TEEC_Result result =
      TEEC_InitializeContext(name.empty() ? nullptr : name.c_str(), &context_);
  if (result != TEEC_SUCCESS) {
    throw Error("cannot open device" + (name.empty() ? "" : " " + name), result,
                Origin::kClientApi);
  }
}

Session::Session(Device &device, const TEEC_UUID &uuid) {
  uint32_t origin = TEEC_ORIGIN_API;
  const TEEC_Result result = TEEC_OpenSession(device.context(), &session_, &uuid, TEEC_LOGIN_PUBLIC,
                                              nullptr, nullptr, &origin);
  if (result != TEEC_SUCCESS) {
    throw Error("cannot open a session", result, static_cast<Origin>(origin));
  }
}

TEEC_Result Session::invoke(uint32_t command_id, TEEC_Operation &operation, Origin &origin) {
  uint32_t number = TEEC_ORIGIN_API;
  const TEEC_Result result = TEEC_InvokeCommand(&session_, command_id, &operation, &number);
  origin = static_cast<Origin>(number);
  return result;
}

Reply Session::invoke(Call call) {
  Buffer output;
  if (call.capacity > 0) output = Buffer(call.capacity, call.fill);
  TEEC_Operation operation{};
  operation.paramTypes = call.types;
  const bool has_input = is_temporary_memory(call.types, 0);
  const bool has_output = is_temporary_memory(call.types, 1);
  if (has_input) operation.params[0].tmpref = reference(call.input);
  if (has_output) operation.params[1].tmpref = reference(output);

  Origin origin;
  const TEEC_Result result = invoke(call.command_id, operation, origin);
  const size_t size = has_output ? operation.params[1].tmpref.size : call.capacity;
  return {result, origin, std::move(output), size};
}

Info read_info(Device &device) {
  Session key_service(device, kKeyServiceUuid);
  Buffer id(kDeviceIdCapacity, kUntouched);
  Buffer key(kPublicKeyCapacity, kUntouched);
  TEEC_Operation operation{};
  operation.paramTypes =
      TEEC_PARAM_TYPES(TEEC_MEMREF_TEMP_OUTPUT, TEEC_MEMREF_TEMP_OUTPUT, TEEC_NONE, TEEC_NONE);
  operation.params[0].tmpref = reference(id);
  operation.params[1].tmpref = reference(key);

  Origin origin;
  const TEEC_Result result = key_service.invoke(kPublicIdentityCommand, operation, origin);
  if (result != TEEC_SUCCESS) throw Error("cannot read the device's identity", result, origin);
  return {written(id, operation.params[0].tmpref.size),
          written(key, operation.params[1].tmpref.size)};
}

std::string build_frame(uint32_t message_id, std::string_view request) {
  std::string frame =
      word(0) + block(DEVICE_CLIENT_NAME) + block(DEVICE_CLIENT_VERSION) + word(message_id);
  if (request.size() > std::numeric_limits<uint32_t>::max() - frame.size() - kWordLen) {
    throw tools::UsageError("the request is too long: expected less than 4 GiB");
  }
  frame.reserve(frame.size() + kWordLen + request.size());
  return frame.append(word(request.size())).append(request);
}

std::string build_query(std::string_view taid) {
  try {
    return word(0) + block(nlohmann::json{{"taid", taid}}.dump());
  } catch (const nlohmann::json::exception &) {
    throw tools::UsageError("bad TAID: expected UTF-8 text");
  }
}

Answer parse_answer(std::string_view buffer, size_t size) {
  Reader in(buffer.substr(0, size));
  const std::optional<uint32_t> status = in.take_word();
  const std::optional<std::string_view> response = in.take_block();
  if (!status || !response) throw malformed("its response ends beyond its end");
  Answer answer;
  answer.status = *status;
  answer.response = *response;

  // Only a success has an image. Room is kept for one after other failures, too, but not filled.
  if (answer.status != 0) {
    const bool image_did_not_fit =
        answer.status == kImageDidNotFit && !response->empty() && size > buffer.size();
    if (image_did_not_fit) answer.needed_capacity = size;
    return answer;
  }
  if (size > buffer.size()) throw malformed("it is longer than the buffer");
  if (in.num_left() == 0) return answer;
  const std::optional<std::string_view> image = in.take_block();
  if (!image || image->empty() || in.num_left() != 0) {
    throw malformed("its TA image does not end where it ends");
  }
  answer.image = std::string(*image);
  return answer;
}

// The image of a TA comes out of its request, so an answer with it needs little more than both.
uint32_t capacity_for(std::string_view request) {
  constexpr size_t kMax = std::numeric_limits<uint32_t>::max();
  return static_cast<uint32_t>(std::min(kDefaultCapacity + request.size(), kMax));
}

Answer send(Session &agent, const Message &message, std::string_view request, uint32_t capacity) {
  // The capacity is for the longest answer: most of it will not be used.
  Call call{.command_id = OTRP_COMMAND_MESSAGE,
            .input = Buffer(build_frame(static_cast<uint32_t>(message.id), request)),
            .capacity = capacity,
            .fill = 0};
  const Reply reply = agent.invoke(std::move(call));
  if (reply.result != TEEC_SUCCESS) throw Error(message.command, reply.result, reply.origin);
  Answer answer = parse_answer(reply.output.bytes(), reply.size);
  answer.request_len = request.size();
  return answer;
}

void require_success(const Message &message, const Answer &answer) {
  if (answer.status != 0) {
    throw Error(message.command, answer.status, Origin::kStatusWord, size_detail(answer));
  }
}

QueryAnswer query(Session &agent, std::string_view taid) {
  const Reply reply = agent.invoke({.command_id = OTRP_COMMAND_STATUS_QUERY,
                                    .input = Buffer(build_query(taid)),
                                    .capacity = kQueryCapacity});
  // A failure's answer, where there is one, repeats the result as its status word.
  const std::string_view buffer = reply.output.bytes();
  const bool is_answered =
      reply.result == TEEC_SUCCESS || Reader(buffer).take_word() == reply.result;
  if (!is_answered) throw Error("query", reply.result, reply.origin);
  return {reply.result, reply.origin, parse_answer(buffer, reply.size).response};
}

std::string device_id(Session &agent) {
  const Reply reply = agent.invoke(
      {.command_id = OTRP_COMMAND_DEVICE_ID, .input = {}, .capacity = kDeviceIdCapacity});
  if (reply.result != TEEC_SUCCESS) throw Error("device-id", reply.result, reply.origin);
  return written(reply.output, reply.size);
}

}  // namespace device
