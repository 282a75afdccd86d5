// SPDX-License-Identifier: BSD-2-Clause
/// A request or an answer, check by check. Nothing stops at the first failure; what needs a key or
/// a state that is not at hand is said to be not checked.
#ifndef TSM_INSPECT_MESSAGE_H
#define TSM_INSPECT_MESSAGE_H

#include <optional>

#include "tsm/inspect/keys.h"
#include "tsm/protocol/messages.h"

namespace tsm {

/// Whom an answer belongs to.
struct Transaction {
  std::string rid;
  std::string tid;
};

/// The message whose name a document bears; NULL when it is none.
const Message *message_in(const Json &root, bool *is_request);

/// Returns the transaction of a request. An answer is compared with `request`, where it is known.
std::optional<Transaction> inspect_message(const Json &root, const AtHand &at_hand,
                                           const std::optional<Transaction> &request,
                                           Report *report);

/// The two kinds, of a known message.
std::optional<Transaction> inspect_request(const Message &message, const Json &envelope,
                                           const AtHand &at_hand, Report *report);
void inspect_answer(const Message &message, const Json &envelope, const AtHand &at_hand,
                    const std::optional<Transaction> &request, Report *report);

/// "dsihash" against the states at hand, and against other ways to compute it from them.
void inspect_dsihash(const std::string &hash, const std::vector<StateAtHand> &states,
                     Report *report);

/// What a result code says and means.
void report_code(uint32_t code, std::string_view name, Report *report);

}  // namespace tsm

#endif
