// SPDX-License-Identifier: BSD-2-Clause
#include "common/near_miss.h"

#include <algorithm>
#include <numeric>

namespace tools {
namespace {

/// How many letters are to be added, taken away or replaced to make one word of the other.
size_t distance(std::string_view one, std::string_view other) {
  std::vector<size_t> row(other.size() + 1);
  std::iota(row.begin(), row.end(), size_t{0});
  for (size_t i = 0; i < one.size(); ++i) {
    size_t diagonal = row[0]++;
    for (size_t j = 0; j < other.size(); ++j) {
      const size_t replaced = diagonal + (one[i] == other[j] ? 0 : 1);
      diagonal = row[j + 1];
      row[j + 1] = std::min({replaced, row[j] + 1, row[j + 1] + 1});
    }
  }
  return row.back();
}

}  // namespace

std::string near_miss(std::string_view word, const std::vector<std::string> &words) {
  const auto near = std::ranges::min_element(
      words, {}, [&](const std::string &known) { return distance(word, known); });
  if (near == words.end()) return "";
  return distance(word, *near) <= std::max<size_t>(1, near->size() / 3) ? *near : "";
}

std::string suggestion(std::string_view word, const std::vector<std::string> &words,
                       const std::string &otherwise) {
  const std::string meant = near_miss(word, words);
  return meant.empty() ? otherwise : "did you mean " + meant + "?";
}

}  // namespace tools
