// SPDX-License-Identifier: BSD-2-Clause
/// An encrypted content, part by part, and what is in it where a key fits.
#ifndef TSM_INSPECT_JWE_H
#define TSM_INSPECT_JWE_H

#include <functional>
#include <optional>
#include <string_view>

#include "tsm/inspect/keys.h"

namespace tsm {

/// Whether `key` has a private half and unwraps the content key of `jwe`.
bool unwraps(const RsaKey &key, const Json &jwe);

/// Reports the members of `jwe`, and returns the plain text when a key that has a chance opens
/// it. `needed` names the key that would.
std::optional<Bytes> inspect_jwe(const Json &jwe, const std::vector<KeyAtHand> &keys,
                                 const std::function<Chance(const KeyAtHand &)> &chance,
                                 std::string_view needed, Report *report);

}  // namespace tsm

#endif
