// SPDX-License-Identifier: BSD-2-Clause
/// What is to be seen of one device:
///
///     {"id", "group", "plan", "state", "reason", "seen", "others",
///      "waits": null or {"message", "deadline", "is_late"},
///      "next": {"message", "reason", "obstacles": [...]},
///      "tree": [{"depth", "kind", "name", "device", "plan", "mark", "difference"}, ...],
///      "events": [{"time", "message", "outcome", "reason", "next"}, ...]}
///
/// A row of the tree is a service provider, one of its domains (a depth below) or a TA in that.
/// What the device has of it and what the plan wants are texts, or null. The mark is "same",
/// "missing", "extra" (not planned), "other" (there, but not so), or "none" where nothing can be
/// compared. "next" is what follows if the device still is as it said last: the message, or what is
/// in the way, or neither where it is as planned or has no plan.
#ifndef TSM_SERVER_DEVICE_PAGE_H
#define TSM_SERVER_DEVICE_PAGE_H

#include <vector>

#include "tsm/plan/plan.h"
#include "tsm/protocol/json.h"
#include "tsm/store/store.h"

namespace tsm {

/// `plan` may be NULL, and needs no images; `now` is in seconds since 1970.
Json device_page(const StoredDevice &row, const std::vector<Event> &events, const Plan *plan,
                 int64_t now);

}  // namespace tsm

#endif
