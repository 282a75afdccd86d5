// SPDX-License-Identifier: BSD-2-Clause
/// One POST of a device: its row as it was read, what the device says, and the row as it is to be
/// written. The cryptography is here, and no database waits for it.
///
///     Visit visit(tsm, keys, row, now);
///     visit.begin();  or  visit.hear(body);
///     request = visit.go_on(plan, time_to_answer);
///     write visit.row() and visit.event()
#ifndef TSM_SERVER_VISIT_H
#define TSM_SERVER_VISIT_H

#include <chrono>
#include <stdexcept>
#include <string>

#include "tsm/plan/decision.h"
#include "tsm/protocol/parties.h"
#include "tsm/protocol/waiting.h"
#include "tsm/store/store.h"

namespace tsm {

/// What was posted is not to be believed, or not what is waited for. The row stays as it is.
class Refusal : public std::runtime_error {
 public:
  Refusal(int status, const char *kind, const std::string &text)
      : std::runtime_error(text), status_(status), kind_(kind) {}
  int status() const { return status_; }      // of HTTP
  const char *kind() const { return kind_; }  // one of a few

 private:
  int status_;
  const char *kind_;
};

/// `now` is in seconds since 1970.
class Visit {
 public:
  /// `tsm` and `keys` must live longer.
  Visit(const Identity &tsm, StoredDevice row, int64_t now);

  /// The device asks whether there is something to do: a session begins, and a message that still
  /// waits for its answer gets none any more.
  void begin();

  /// The device answers the message that waits. Throws a Refusal.
  void hear(const std::string &body);

  /// The next request, which then waits; empty where there is none, because the plan is met, or in
  /// vain, or NULL.
  std::string go_on(const Plan *plan, std::chrono::seconds time_to_answer);

  const StoredDevice &row() const { return row_; }
  const Event &event() const { return event_; }
  /// The message that begin() gave up; empty: none.
  const std::string &lost() const { return lost_; }

 private:
  const DeviceInfo &device();
  Response verified(Envelope envelope);
  void set_outcome(const char *outcome, const std::string &reason);
  std::string follow(Decision decision);
  std::string try_to_send(Order order, const std::string &reason);
  std::string send(Order order);

  const Identity &tsm_;
  StoredDevice row_;
  int64_t now_;
  Progress progress_;
  Event event_;
  std::string lost_;
  std::optional<DeviceInfo> device_;
};

}  // namespace tsm

#endif
