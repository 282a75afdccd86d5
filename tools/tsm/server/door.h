// SPDX-License-Identifier: BSD-2-Clause
/// The door that devices knock at: one POST, in one short transaction, whatever becomes of it.
#ifndef TSM_SERVER_DOOR_H
#define TSM_SERVER_DOOR_H

#include <chrono>
#include <string>

#include "tsm/protocol/parties.h"
#include "tsm/server/plan_shelf.h"
#include "tsm/store/store.h"

namespace tsm {

struct DoorAnswer {
  int status = 204;          // of HTTP
  std::string text = {};     // of 200 the next request, of a refusal its reason
  std::string message = {};  // that was answered, "call" for an empty POST; empty: none
  std::string outcome = {};  // "call", "pass", "fail", or a kind of refusal
  std::string lost = {};     // a message that was given up
  std::string next = {};     // for a log: what is asked next
};

int64_t seconds_now();  // since 1970

/// Whether a device can have this ID here: UTF-8 without control characters, not too long.
bool is_device_id(std::string_view device_id);

class Door {
 public:
  /// Both must live longer.
  Door(const Identity &tsm, Store *store, std::chrono::seconds time_to_answer)
      : tsm_(tsm), store_(store), plans_(store), time_to_answer_(time_to_answer) {}

  /// By any number of threads. Throws StoreError, and std::runtime_error for what is damaged in the
  /// store.
  DoorAnswer post(const std::string &device_id, const std::string &body);

 private:
  DoorAnswer serve(StoredDevice row, const std::string &body);

  const Identity &tsm_;
  Store *store_;
  PlanShelf plans_;
  std::chrono::seconds time_to_answer_;
};

}  // namespace tsm

#endif
