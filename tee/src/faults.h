// SPDX-License-Identifier: BSD-2-Clause
/// Faults on order: which call of a trusted application is to fail, for tests.
#ifndef TEE_FAULTS_H
#define TEE_FAULTS_H

#include <tee_test.h>

#include <atomic>
#include <map>
#include <mutex>
#include <utility>

#include "uuid.h"

namespace tee {

class FaultPlans {
 public:
  /// As test::Device::fail().
  void set(const UuidBytes &ta, test::Fault fault, unsigned nth, bool and_after, TEE_Result code);
  void clear();
  test::FaultReport report() const;

  /// As fault_due(), for a call that `ta` makes. Costs one load while no plan is set.
  bool due(const UuidBytes &ta, test::Fault fault, const char *call, TEE_Result natural,
           TEE_Result *code) {
    return armed_.load(std::memory_order_relaxed) && count(ta, fault, call, natural, code);
  }

  /// Whether a kFullHeap plan forbids an allocation of `ta`, with which `bytes` would be in use.
  bool forbids(const UuidBytes &ta, uint64_t bytes) {
    return armed_.load(std::memory_order_relaxed) && exceeds_limit(ta, bytes);
  }

 private:
  struct Plan {
    unsigned calls_left;  // 1: the next one is hit; of kFullHeap the limit in bytes
    bool and_after;
    TEE_Result code;
  };

  bool count(const UuidBytes &ta, test::Fault fault, const char *call, TEE_Result natural,
             TEE_Result *code);
  bool exceeds_limit(const UuidBytes &ta, uint64_t bytes);

  std::atomic<bool> armed_ = false;
  mutable std::mutex lock_;
  std::map<std::pair<UuidBytes, test::Fault>, Plan> plans_;
  test::FaultReport report_;
};

}  // namespace tee

#endif
