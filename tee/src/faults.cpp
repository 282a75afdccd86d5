// SPDX-License-Identifier: BSD-2-Clause
#include "faults.h"

#include <algorithm>

namespace tee {

void FaultPlans::set(const UuidBytes &ta, test::Fault fault, unsigned nth, bool and_after,
                     TEE_Result code) {
  const std::lock_guard guard(lock_);
  plans_[{ta, fault}] = {nth, and_after, code};
  report_ = {};
  armed_ = true;
}

void FaultPlans::clear() {
  const std::lock_guard guard(lock_);
  armed_ = false;
  plans_.clear();
  report_ = {};
}

test::FaultReport FaultPlans::report() const {
  const std::lock_guard guard(lock_);
  return report_;
}

bool FaultPlans::count(const UuidBytes &ta, test::Fault fault, const char *call, TEE_Result natural,
                       TEE_Result *code) {
  const std::lock_guard guard(lock_);
  const auto plan = plans_.find({ta, fault});
  if (plan == plans_.end()) return false;
  if (plan->second.calls_left > 1) {
    --plan->second.calls_left;
    return false;
  }
  report_ = {true, call, 0};
  *code = plan->second.code != 0 ? plan->second.code : natural;
  if (!plan->second.and_after) {
    plans_.erase(plan);
    armed_ = !plans_.empty();
  }
  return true;
}

bool FaultPlans::exceeds_limit(const UuidBytes &ta, uint64_t bytes) {
  const std::lock_guard guard(lock_);
  const auto plan = plans_.find({ta, test::Fault::kFullHeap});
  if (plan == plans_.end()) return false;
  if (bytes > plan->second.calls_left) {
    report_.fired = true;
    report_.call = "TEE_Malloc";
    return true;
  }
  report_.heap_in_use = std::max(report_.heap_in_use, static_cast<uint32_t>(bytes));
  return false;
}

}  // namespace tee
