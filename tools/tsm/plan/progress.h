// SPDX-License-Identifier: BSD-2-Clause
/// What is known of a device on its way to a plan, from its verified answers alone.
///
/// Some of it outlives a session: whose domains are, which versions were told since the plan was
/// last met, and which TAs are in doubt, because a message about them was sent and no answer came.
#ifndef TSM_PLAN_PROGRESS_H
#define TSM_PLAN_PROGRESS_H

#include <map>
#include <optional>
#include <set>
#include <string>

#include "tsm/protocol/order.h"
#include "tsm/protocol/response.h"

namespace tsm {

struct Progress {
  std::map<std::string, bool> is_ours = {};          // by SD, where it is known
  std::map<std::string, std::string> versions = {};  // by TA ID
  std::set<std::string> doubtful = {};               // TA IDs
  std::map<std::string, int> unanswered = {};        // by TA ID: lost questions, in a row

  // Of one session.
  std::optional<Json> state = {};            // none: to be asked for
  bool has_changed = false;                  // since the device was asked for its state
  std::map<std::string, int> attempts = {};  // by attempt_key()
  std::string last_refusal = {};
  std::set<std::string> imagined_aiks = {};  // SPs, see imagine()
};

/// Forgets what is of one session.
void begin_session(Progress *progress);

/// Does it change something on the device? An UpdateSD that renews nothing only asks.
bool changes_device(const Order &order);

/// What the attempts at one thing are counted under.
std::string attempt_key(const Order &order);

/// The verified answer to an order; `refusal` says why it is one, or is empty.
void learn(const Order &order, const Response &response, const std::string &refusal,
           Progress *progress);

/// No answer came, or none that could be believed: what the order would have changed is in doubt.
void learn_nothing(const Order &order, const std::string &why, Progress *progress);

/// The same, of an answer that may only be lost on its way: then a question about a TA has done
/// nothing. But a device that cannot tell of a TA gives no answer either, so the TA is in doubt
/// after a few in a row.
void learn_loss(const Order &order, const std::string &why, Progress *progress);

/// The plan is met.
void settle(Progress *progress);

/// As if the order had been carried out, on a state that is known: for a plan that is only told.
void imagine(const Order &order, Progress *progress);

/// What outlives a session, as JSON; the reader takes anything and passes over what it cannot read.
Json progress_json(const Progress &progress);
Progress parse_progress(const Json &value);

}  // namespace tsm

#endif
