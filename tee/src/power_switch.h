// SPDX-License-Identifier: BSD-2-Clause
/// A storage whose power can be cut, for tests: it counts durable writes and, once cut, lets none
/// through. Trusted applications notice nothing, as on a device that dies a moment later: they see
/// what they wrote until the power is back, and then what storage really holds.
#ifndef TEE_POWER_SWITCH_H
#define TEE_POWER_SWITCH_H

#include "faults.h"
#include "storage.h"

namespace tee {

class PowerSwitch : public Storage {
 public:
  PowerSwitch(std::unique_ptr<Storage> medium, FaultPlans &faults)
      : medium_(std::move(medium)), faults_(faults) {}

  std::optional<Bytes> load(const ObjectKey &key) override;
  void save(const ObjectKey &key, ByteView data) override;
  bool remove(const ObjectKey &key) override;
  std::vector<ObjectListing> list(const UuidBytes &ta) override;

  Storage &medium() { return *medium_; }
  uint64_t durable_writes() const { return durable_writes_; }
  void restore();

 private:
  bool reaches_medium(const char *change, const ObjectKey &key);

  std::unique_ptr<Storage> medium_;
  FaultPlans &faults_;
  uint64_t durable_writes_ = 0;
  bool cut_ = false;
  std::map<ObjectKey, std::optional<Bytes>> lost_;  // written since the cut; nullopt: removed
};

}  // namespace tee

#endif
