// SPDX-License-Identifier: BSD-2-Clause
/// Plans on their way to the store and back.
///
///     {"domains": [{"sd", "sp", "cert", "apps": [{"taid", "version", "image": digest}]}],
///      "others": "keep" | "delete"}
#ifndef TSM_SERVER_PLAN_SHELF_H
#define TSM_SERVER_PLAN_SHELF_H

#include <deque>
#include <memory>
#include <mutex>
#include <string>

#include "tsm/plan/plan.h"
#include "tsm/store/store.h"

namespace tsm {

/// Plans that say the same have the same digest.
StoredPlan stored_plan(const Plan &plan);

/// Without its images, which are only to be sent; the same exceptions as PlanShelf::find().
Plan plan_outline(const std::string &digest, Store *store);

/// The plans that were asked for last. A digest stands for one plan for ever, so what is here is
/// never old. For any number of threads.
class PlanShelf {
 public:
  explicit PlanShelf(Store *store) : store_(store) {}

  /// NULL for no digest. Throws StoreError, or std::runtime_error for a plan that is not whole.
  std::shared_ptr<const Plan> find(const std::string &digest);

 private:
  struct Entry {
    std::string digest;
    std::shared_ptr<const Plan> plan;
  };
  std::shared_ptr<const Plan> find_here(const std::string &digest);

  Store *store_;
  std::mutex lock_;  // of entries_
  std::deque<Entry> entries_;
};

}  // namespace tsm

#endif
