// SPDX-License-Identifier: BSD-2-Clause
/// A device as the normal world sees it: sessions over the TEE Client API, the frames of the
/// agent's commands, and the commands themselves.
///
/// Integers in frames are 32-bit little-endian, texts have no terminator:
///
///     message    in   reserved | L1 | client name | L2 | client version | message ID | M | request
///                out  status | R | response [ | T | TA image ]
///     query      in   reserved | L | {"taid":"..."}
///                out  status | N | answer
///
/// Bytes travel in std::string. Every failure of the device is thrown as an Error.
#ifndef DEVICE_DEVICE_CLIENT_H
#define DEVICE_DEVICE_CLIENT_H

// The headers of some vendors know nothing of C++.
extern "C" {
#include <tee_client_api.h>
}

#include <cstdint>
#include <cstdlib>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

#include "common/messages.h"

namespace device {

extern const TEEC_UUID kAgentUuid;
extern const TEEC_UUID kKeyServiceUuid;

/// Where a result code arose. A message can fail although its command succeeded: the code then
/// stands in the status word of the answer.
enum class Origin : uint32_t {
  kClientApi = TEEC_ORIGIN_API,
  kCommunication = TEEC_ORIGIN_COMMS,
  kTee = TEEC_ORIGIN_TEE,
  kTrustedApp = TEEC_ORIGIN_TRUSTED_APP,
  kStatusWord = 0x100,
  kAnswer,  // the answer makes no sense to this client
};

/// what() is one line: the action, the code with its name, its origin, and `detail`, or else what
/// the TEE says of its latest failure, or else the hint that belongs to the code.
class Error : public std::runtime_error {
 public:
  Error(std::string_view action, TEEC_Result code, Origin origin, std::string_view detail = {});
  TEEC_Result code() const { return code_; }
  Origin origin() const { return origin_; }

 private:
  TEEC_Result code_;
  Origin origin_;
};

/// Memory that a trusted application gets to see. It is exactly as long as it says, so that a
/// memory checker notices the first byte too far. An absent buffer (NULL) differs from an empty
/// one.
class Buffer {
 public:
  Buffer() = default;  // absent
  Buffer(size_t size, uint8_t fill);
  explicit Buffer(std::string_view bytes);

  uint8_t *data() { return bytes_.get(); }
  size_t size() const { return size_; }
  std::string_view bytes() const;

 private:
  struct Free {
    void operator()(uint8_t *bytes) const { free(bytes); }
  };
  std::unique_ptr<uint8_t[], Free> bytes_;
  size_t size_ = 0;
};

/// A device that this process owns while the object lives.
class Device {
 public:
  /// `name` is the host TEE's state directory, or what another Client API calls the TEE; without
  /// one that gets NULL, the usual name.
  explicit Device(const std::string &name);
  ~Device() { TEEC_FinalizeContext(&context_); }
  Device(const Device &) = delete;
  Device &operator=(const Device &) = delete;

  TEEC_Context *context() { return &context_; }

 private:
  TEEC_Context context_{};
};

constexpr uint16_t kMessageTypes =
    TEEC_PARAM_TYPES(TEEC_MEMREF_TEMP_INPUT, TEEC_MEMREF_TEMP_OUTPUT, TEEC_NONE, TEEC_NONE);
constexpr uint8_t kUntouched = 0xA5;  // what an output buffer is full of before a call

/// One invocation. Parameter 0 carries `input` and parameter 1 a buffer of `capacity` bytes for the
/// output, full of `fill` (absent when 0), where `types`, a nibble each, makes them temporary
/// memory references, whatever their direction. Other parameters are value pairs of 0 or absent
/// memory.
struct Call {
  uint32_t command_id = 0;
  Buffer input;
  uint32_t capacity = 0;
  uint16_t types = kMessageTypes;
  uint8_t fill = kUntouched;
};

struct Reply {
  TEEC_Result result;
  Origin origin;
  Buffer output;  // all of it, also after a failure
  size_t size;    // of parameter 1 as the trusted application left it; may exceed the buffer
};

/// A session with a trusted application. The Device must outlive it.
class Session {
 public:
  Session(Device &device, const TEEC_UUID &uuid);
  ~Session() { TEEC_CloseSession(&session_); }
  Session(const Session &) = delete;
  Session &operator=(const Session &) = delete;

  /// Never throws an Error: a failure is part of the reply.
  Reply invoke(Call call);

  /// The same with parameters of any shape.
  TEEC_Result invoke(uint32_t command_id, TEEC_Operation &operation, Origin &origin);

 private:
  TEEC_Session session_{};
};

/// What a TSM operator needs to know of a device.
struct Info {
  std::string device_id;
  std::string tee_public_key;  // modulus length | modulus | exponent length | exponent
};
Info read_info(Device &device);

using tools::Message;
inline const Message *find_message(std::string_view command) {
  return tools::find_message_by_command(command);  // NULL when there is none
}

/// Throws tools::UsageError when the frame would be longer than 32 bits can say.
std::string build_frame(uint32_t message_id, std::string_view request);
std::string build_query(std::string_view taid);  // throws tools::UsageError for bad UTF-8

struct Answer {
  uint32_t status = 0;
  std::string response;              // empty when there is none
  std::optional<std::string> image;  // the TA image
  size_t needed_capacity = 0;        // 0, unless the TA image did not fit
  size_t request_len = 0;            // of what is answered, as far as known
};

/// Reads the answer in `buffer`, of which the agent said that it takes `size` bytes.
Answer parse_answer(std::string_view buffer, size_t size);

constexpr uint32_t kDefaultCapacity = 4 << 20;

/// A capacity that any answer to `request` fits.
uint32_t capacity_for(std::string_view request);

/// Sends a signed request. A message that fails is an answer, see require_success(); a response
/// that says "fail" is a success.
Answer send(Session &agent, const Message &message, std::string_view request,
            uint32_t capacity = kDefaultCapacity);

/// Throws an Error when the status word says that the message failed. The answer may hold a
/// response nevertheless: when only the TA image did not fit, the device has carried it out.
void require_success(const Message &message, const Answer &answer);

struct QueryAnswer {
  TEEC_Result result;
  Origin origin;
  std::string text;
};

/// Asks whether the agent knows a TA. An answer of "not found" has a failure code, too; a failure
/// without an answer is thrown.
QueryAnswer query(Session &agent, std::string_view taid);

std::string device_id(Session &agent);

}  // namespace device

#endif
