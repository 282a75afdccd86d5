// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/server/visit.h"

#include "common/error_line.h"
#include "tsm/protocol/dsi.h"
#include "tsm/server/stored_progress.h"

namespace tsm {
namespace {

std::string joined(const std::vector<std::string> &lines) {
  std::string text;
  for (const std::string &line : lines) text += (text.empty() ? "" : "; ") + line;
  return text;
}

/// What an answer to `order` is tied to.
SentRequest sent_request(const Order &order) {
  const RequestOptions &options = order.options;
  SentRequest sent = {.message = &message_of(order.message)};
  if (order.message == MessageId::kGetTaInfo) {
    sent.spid = options.spid;
    sent.taid = options.taid;
  } else {
    sent.rid = options.rid;
    sent.tid = options.tid;
    sent.dsihash = options.dsihash;
  }
  return sent;
}

DeviceInfo stored_device(const StoredDevice &row) {
  const std::optional<Bytes> encoded = base64url_decode(row.key);
  const std::optional<RsaKey> key = encoded ? RsaKey::from_encoded(*encoded) : std::nullopt;
  if (!key) throw std::runtime_error("the stored key of device " + row.device_id + " is damaged");
  return {row.device_id, *key};
}

Envelope envelope_of(const std::string &body) {
  try {
    return parse_envelope(body);
  } catch (const NotVerified &error) {
    throw Refusal(400, "malformed", error.what());
  }
}

}  // namespace

Visit::Visit(const Identity &tsm, StoredDevice row, int64_t now)
    : tsm_(tsm), row_(std::move(row)), now_(now), progress_(stored_progress(row_)) {
  row_.seen = now;
  event_.time = now;
}

void Visit::begin() {
  event_.message = event_.outcome = "call";
  if (!row_.open_message.empty()) {
    const OpenRequest open = parse_open_request(row_.open_request);
    lost_ = row_.open_message;
    event_.reason = order_text(open.order) + " was not answered";
    learn_loss(open.order, event_.reason, &progress_);
  }
  begin_session(&progress_);
}

const DeviceInfo &Visit::device() {
  if (!device_) device_ = stored_device(row_);
  return *device_;
}

Response Visit::verified(Envelope envelope) {
  const Json *dsi = progress_.state ? &*progress_.state : nullptr;
  try {
    return open_response(std::move(envelope),
                         {.tee_key = device().tee_key, .tsm_key = tsm_.key, .dsi = dsi});
  } catch (const NotVerified &error) {
    throw Refusal(403, "stranger", error.what());
  } catch (const tools::UsageError &error) {
    throw Refusal(403, "stranger", error.what());
  }
}

void Visit::hear(const std::string &body) {
  if (row_.open_message.empty()) {
    throw Refusal(409, "unasked", "no message waits for an answer: expected an empty POST");
  }
  if (row_.deadline <= now_) {
    throw Refusal(409, "late", "the message waits no longer: expected an empty POST");
  }
  const OpenRequest open = parse_open_request(row_.open_request);
  Envelope envelope = envelope_of(body);
  // To verify it with, and to go on with: all other answers bring a state, or leave it unknown.
  if (envelope.message->id == MessageId::kGetTaInfo) progress_.state = parse_json(row_.state);
  const Response response = verified(std::move(envelope));
  if (!tie_of(response, open.sent)) {
    throw Refusal(409, "other",
                  "the response does not answer the message that waits (" + row_.open_message +
                      "): expected its rid and tid");
  }
  event_.message = row_.open_message;
  event_.reason = refusal_of(response);
  event_.outcome = event_.reason.empty() ? "pass" : "fail";
  learn(open.order, response, event_.reason, &progress_);
  if (response.dsi_text && progress_.state) row_.state = compact(*progress_.state);
}

void Visit::set_outcome(const char *outcome, const std::string &reason) {
  row_.outcome = outcome;
  row_.outcome_plan = row_.plan;
  row_.reason = reason;
}

std::string Visit::go_on(const Plan *plan, std::chrono::seconds time_to_answer) {
  row_.open_message.clear();
  row_.open_request.clear();
  row_.deadline = 0;
  std::string request;
  if (plan != nullptr) request = follow(decide(*plan, progress_));
  if (!request.empty()) row_.deadline = now_ + time_to_answer.count();
  row_.progress = progress_text(progress_);
  return request;
}

std::string Visit::follow(Decision decision) {
  if (decision.order) return try_to_send(std::move(*decision.order), decision.reason);
  if (decision.obstacles.empty()) {
    set_outcome("current", "");
    settle(&progress_);
  } else {
    set_outcome("refused", joined(decision.obstacles));
  }
  return "";
}

/// What cannot be made, for want of the CA's key, say, is in the way like what the device refuses.
std::string Visit::try_to_send(Order order, const std::string &reason) {
  const std::string text = order_text(order);
  const bool is_news = row_.outcome.empty() || changes_device(order);
  if (is_news) set_outcome("behind", text + ": " + reason);
  try {
    std::string request = send(std::move(order));
    event_.next = text;
    return request;
  } catch (const tools::UsageError &error) {
    set_outcome("refused", text + ": " + error.what());
    return "";
  }
}

std::string Visit::send(Order order) {
  RequestOptions &options = order.options;
  options.rid = random_id();
  options.tid = random_id();
  const Json *state = progress_.state ? &*progress_.state : nullptr;
  if (quotes_dsi(order.message)) options.dsihash = dsi_hash(*state);
  std::string waiting = open_request_text(order, sent_request(order));
  std::string text = make_request(order.message, std::move(options), tsm_, device(), state);
  row_.open_message = message_of(order.message).command;
  row_.open_request = std::move(waiting);
  return text;
}

}  // namespace tsm
