// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/inspect/input.h"

#include <otrp.h>

#include "common/result_names.h"
#include "tsm/inspect/content.h"
#include "tsm/inspect/fields.h"
#include "tsm/inspect/message.h"
#include "tsm/protocol/dsi.h"
#include "tsm/protocol/image.h"

namespace tsm {
namespace {

/// Reads a frame front to back, and remembers what did not fit.
class Reader {
 public:
  explicit Reader(std::string_view bytes) : left_(bytes) {}

  uint32_t word(const char *name) {
    const std::string_view bytes = take(name, OTRP_WORD_LEN);
    return bytes.empty() ? 0 : otrp_get_u32(reinterpret_cast<const uint8_t *>(bytes.data()));
  }
  std::string_view block(const char *name) {
    const uint32_t len = word(name);
    return take(name, len);
  }
  bool at_end() const { return left_.empty(); }
  bool is_whole() const { return problem_.empty() && left_.empty(); }
  std::string problem() const {
    if (!problem_.empty() || left_.empty()) return problem_;
    return bytes_text(left_.size()) + " behind its end";
  }

 private:
  std::string_view take(const char *name, size_t len) {
    if (!problem_.empty()) return {};
    if (len > left_.size()) {
      problem_ = std::string(name) + " takes " + bytes_text(len) + ", but " +
                 std::to_string(left_.size()) + " are left";
      return {};
    }
    const std::string_view bytes = left_.substr(0, len);
    left_.remove_prefix(len);
    return bytes;
  }

  std::string_view left_;
  std::string problem_;
};

struct MessageFrame {
  std::string_view first;
  std::string_view second;
  uint32_t id = 0;
  std::string_view text;
  std::string problem;
};

MessageFrame read_message_frame(std::string_view bytes) {
  Reader in(bytes);
  MessageFrame frame;
  in.word("the reserved word");
  frame.first = in.block("the first block");
  frame.second = in.block("the second block");
  frame.id = in.word("the message ID");
  frame.text = in.block("the request");
  frame.problem = in.problem();
  return frame;
}

struct AnswerFrame {
  uint32_t status = 0;
  std::string_view text;
  std::string_view image;
  std::string problem;
};

AnswerFrame read_answer_frame(std::string_view bytes) {
  Reader in(bytes);
  AnswerFrame frame;
  frame.status = in.word("the status");
  frame.text = in.block("the response");
  if (!in.at_end()) frame.image = in.block("the TA image");
  frame.problem = in.problem();
  return frame;
}

// ---- JSON

void inspect_device_file(const Json &root, Report *report) {
  shown_field(root, "device_id", report);
  const std::string *key = text_field(root, "tee_public_key", report);
  if (key == nullptr) return;
  const std::optional<Bytes> encoded = base64url_decode(*key);
  if (encoded && RsaKey::from_encoded(*encoded)) {
    report->fact("tee_public_key", key_or_text(*key));
  } else {
    report->failed("tee_public_key", "is no base64url text of an encoded key");
  }
}

void inspect_http_failure(const Json &root, Report *report) {
  shown_field(root, "message", report);
  const std::string *code = text_field(root, "code", report);
  const tools::ResultName *result = code == nullptr ? nullptr : tools::find_result_by_text(*code);
  if (result != nullptr) report_code(result->code, "code", report);
}

/// An exchange of docs/examples brings the state that it was made for.
void inspect_exchange(const Json &root, AtHand at_hand, Report *report) {
  const std::string *state = find_string(root, "device_state_before");
  if (state != nullptr && !state->empty()) {
    at_hand.states.push_back({"\"device_state_before\"", *state});
  }
  const std::optional<Transaction> request =
      inspect_message(root.at("request"), at_hand, std::nullopt, report);
  const auto response = root.find("response");
  if (response != root.end()) inspect_message(*response, at_hand, request, report);
}

void inspect_json(const Json &root, const AtHand &at_hand, Report *report) {
  if (find_object(root, "request") != nullptr) return inspect_exchange(root, at_hand, report);
  if (is_dsi_document(root)) {
    report->begin("device state");
    return report->fact("dsihash", dsi_hash(root));
  }
  if (find_string(root, "tee_public_key") != nullptr) {
    report->begin("device file");
    return inspect_device_file(root, report);
  }
  if (find_string(root, "message") != nullptr && find_string(root, "code") != nullptr) {
    report->begin("failure of the HTTP service");
    return inspect_http_failure(root, report);
  }
  inspect_message(root, at_hand, std::nullopt, report);
}

void inspect_text(std::string_view text, const AtHand &at_hand, Report *report) {
  const std::optional<Json> root = parse_json(text);
  if (root) return inspect_json(*root, at_hand, report);
  report->begin("no message");
  report->failed("format", "no JSON: " + json_problem(text));
}

// ---- Frames

void report_problem(const std::string &problem, Report *report) {
  if (!problem.empty()) report->failed("frame", problem);
}

void inspect_message_id(const MessageFrame &frame, Report *report) {
  bool is_request = false;
  const std::optional<Json> root = parse_json(frame.text);
  const Message *message = root ? message_in(*root, &is_request) : nullptr;
  const std::string id = std::to_string(frame.id);
  if (frame.id < OTRP_GET_DEVICE_STATE || frame.id > OTRP_GET_TA_INFO) {
    report->failed("message ID", id + ": expected 1 to 8");
  } else if (message == nullptr || !is_request) {
    report->fact("message ID", id + ", " + std::string(messages()[frame.id - 1].request));
  } else if (static_cast<uint32_t>(message->id) == frame.id) {
    report->verified("message ID", id + ", the request's");
  } else {
    report->failed("message ID", id + ", " + std::string(messages()[frame.id - 1].request) +
                                     ": the request is a " + std::string(message->request));
  }
}

void inspect_message_frame(const MessageFrame &frame, const AtHand &at_hand, Report *report) {
  report->begin("frame of a request");
  report_problem(frame.problem, report);
  for (const std::string_view block : {frame.first, frame.second}) {
    if (block.empty()) {
      report->failed("block", "empty: expected what the client says of itself");
    } else {
      report->fact("block", block);
    }
  }
  inspect_message_id(frame, report);
  if (!frame.text.empty()) inspect_text(frame.text, at_hand, report);
}

void inspect_query(const Json &root, Report *report) {
  for (const char *name : {"taid", "status", "msg"}) {
    if (find_string(root, name) != nullptr) shown_field(root, name, report);
  }
}

void inspect_answer_frame(const AnswerFrame &frame, const AtHand &at_hand, Report *report) {
  const std::optional<Json> root = parse_json(frame.text);
  const bool is_query = root && find_string(*root, "taid") != nullptr && frame.status == 0;
  const bool is_status = root && find_string(*root, "msg") != nullptr;
  report->begin(is_query ? "frame of a status query" : "frame of an answer");
  report_problem(frame.problem, report);
  if (is_query) return inspect_query(*root, report);
  if (frame.status == 0) report->fact("status", "0");
  if (frame.status != 0) report_code(frame.status, "status", report);
  if (is_status) return inspect_query(*root, report);
  if (!frame.text.empty()) inspect_text(frame.text, at_hand, report);
  if (!frame.image.empty()) inspect_image(frame.image, report);
}

/// What it comes closest to: a whole frame, or one whose beginning can be read.
void inspect_binary(std::string_view bytes, const AtHand &at_hand, Report *report) {
  const MessageFrame request = read_message_frame(bytes);
  const AnswerFrame answer = read_answer_frame(bytes);
  const bool is_request = request.problem.empty() || (request.id != 0 && !request.first.empty());
  const bool is_answer = answer.problem.empty() || answer.text.starts_with('{');
  if (answer.problem.empty() && !request.problem.empty()) {
    return inspect_answer_frame(answer, at_hand, report);
  }
  if (is_request) return inspect_message_frame(request, at_hand, report);
  if (is_answer) return inspect_answer_frame(answer, at_hand, report);
  if (parse_image(bytes)) return inspect_image(bytes, report);
  report->begin("no message");
  report->failed("format", "neither JSON nor a frame (of a request: " + request.problem +
                               "; of an answer: " + answer.problem + ") nor a TA image");
}

bool looks_like_text(std::string_view bytes) {
  const size_t first = bytes.find_first_not_of(" \t\r\n");
  return first == bytes.npos || bytes[first] == '{' || bytes[first] == '[' || bytes[first] == '"';
}

}  // namespace

void inspect_bytes(const std::string &name, std::string_view bytes, const AtHand &at_hand,
                   Report *report) {
  report->begin(name == "-" ? "standard input" : name);
  if (looks_like_text(bytes)) {
    inspect_text(bytes, at_hand, report);
  } else {
    inspect_binary(bytes, at_hand, report);
  }
}

}  // namespace tsm
