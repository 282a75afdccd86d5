// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/inspect/keys.h"

namespace tsm {

Chance chance_as(Party party, const KeyAtHand &key) {
  if (key.party == party) return Chance::kMustFit;
  return key.party == Party::kAny ? Chance::kSome : Chance::kNone;
}

KeySearch find_key(const std::vector<KeyAtHand> &keys,
                   const std::function<Chance(const KeyAtHand &)> &chance,
                   const std::function<bool(const KeyAtHand &)> &fits) {
  KeySearch search;
  for (const KeyAtHand &key : keys) {
    const Chance expected = chance(key);
    if (expected == Chance::kNone) continue;
    if (fits(key)) return {key};
    const bool is_failure = key.was_named && expected == Chance::kMustFit;
    if (is_failure) search.tried += (search.tried.empty() ? "" : ", ") + key.name;
  }
  return search;
}

void report_search(const KeySearch &search, std::string_view name, std::string_view what,
                   std::string_view needed, Report *report) {
  const std::string subject(what);
  const std::string start = subject.empty() ? "" : subject + ": ";
  if (search.found) {
    report->verified(name, subject + (subject.empty() ? "" : ", ") + "by " + search.found->name +
                               ", " + search.found->key.fingerprint());
  } else if (!search.tried.empty()) {
    report->failed(name, start + "not by " + search.tried);
  } else {
    report->not_checked(name, start + "needs " + std::string(needed));
  }
}

}  // namespace tsm
