// SPDX-License-Identifier: BSD-2-Clause
/// Words that were mistyped.
#ifndef COMMON_NEAR_MISS_H
#define COMMON_NEAR_MISS_H

#include <string>
#include <string_view>
#include <vector>

namespace tools {

/// The one of `words` that was meant by `word`, as far as a few letters tell; empty when none is
/// near.
std::string near_miss(std::string_view word, const std::vector<std::string> &words);

/// `did you mean it?`, or else `otherwise`.
std::string suggestion(std::string_view word, const std::vector<std::string> &words,
                       const std::string &otherwise);

}  // namespace tools

#endif
