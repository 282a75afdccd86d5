// SPDX-License-Identifier: BSD-2-Clause
/// The keys and device states that an inspector has at hand, and the search for the one that fits.
#ifndef TSM_INSPECT_KEYS_H
#define TSM_INSPECT_KEYS_H

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "tsm/inspect/report.h"
#include "tsm/protocol/crypto.h"

namespace tsm {

enum class Party { kAny, kTsm, kCa, kDevice, kProvider };

struct KeyAtHand {
  std::string name;  // where it comes from
  RsaKey key;
  Party party = Party::kAny;  // whose it is known to be
  std::string tsmid = {};     // of Party::kTsm, if it is known
  bool was_named = true;      // by the operator: it is meant to fit
};

struct StateAtHand {
  std::string name;
  std::string text;  // of the document
  bool was_named = true;
};

struct AtHand {
  std::vector<KeyAtHand> keys;
  std::vector<StateAtHand> states;
  std::optional<std::string> device_id;
};

/// What is known of a key before it is tried.
enum class Chance { kNone, kSome, kMustFit };

/// kMustFit for a key of this party, kSome for one of nobody in particular.
Chance chance_as(Party party, const KeyAtHand &key);

/// The first of `keys` that has a chance and fits, and the names of those that had to fit and were
/// named by the operator.
struct KeySearch {
  std::optional<KeyAtHand> found = std::nullopt;
  std::string tried = {};
};
KeySearch find_key(const std::vector<KeyAtHand> &keys,
                   const std::function<Chance(const KeyAtHand &)> &chance,
                   const std::function<bool(const KeyAtHand &)> &fits);

/// Reports a search as the check `name`: verified with a key, failed with those that had to fit, or
/// not checked for want of `needed`. `what` says what was checked, and may be empty.
void report_search(const KeySearch &search, std::string_view name, std::string_view what,
                   std::string_view needed, Report *report);

}  // namespace tsm

#endif
