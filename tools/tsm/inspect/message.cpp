// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/inspect/message.h"

#include <algorithm>

#include "common/result_names.h"

namespace tsm {

const Message *message_in(const Json &root, bool *is_request) {
  if (!root.is_object() || root.size() != 1) return nullptr;
  const std::string &name = root.begin().key();
  const auto found = std::ranges::find_if(messages(), [&](const Message &message) {
    return message.request == name || message.response == name;
  });
  if (found == messages().end()) return nullptr;
  *is_request = found->request == name;
  return &*found;
}

std::optional<Transaction> inspect_message(const Json &root, const AtHand &at_hand,
                                           const std::optional<Transaction> &request,
                                           Report *report) {
  bool is_request = false;
  const Message *message = message_in(root, &is_request);
  if (message == nullptr) {
    report->begin("no message");
    report->failed("outer member", root.is_object() && root.size() == 1
                                       ? root.begin().key() + ": no message has this name"
                                       : "expected an object with one member, a message's name");
    return std::nullopt;
  }
  if (is_request) return inspect_request(*message, root.front(), at_hand, report);
  inspect_answer(*message, root.front(), at_hand, request, report);
  return std::nullopt;
}

void report_code(uint32_t code, std::string_view name, Report *report) {
  report->fact(name, tools::describe_result(code));
}

}  // namespace tsm
