// SPDX-License-Identifier: BSD-2-Clause
#ifndef TSM_SERVER_KEY_SHELF_H
#define TSM_SERVER_KEY_SHELF_H

#include <deque>
#include <map>
#include <mutex>
#include <string>

#include "tsm/protocol/parties.h"
#include "tsm/store/store.h"

namespace tsm {

/// The keys of the devices that began last: made once for a session, and not for each of its
/// exchanges. For any number of threads.
class KeyShelf {
 public:
  /// Throws std::runtime_error for a damaged key.
  DeviceInfo device(const StoredDevice &row);

 private:
  using Keys = std::map<std::string, RsaKey>;

  std::mutex lock_;                    // of all below
  Keys keys_;                          // by what the row says
  std::deque<Keys::iterator> by_age_;  // the oldest first
};

}  // namespace tsm

#endif
