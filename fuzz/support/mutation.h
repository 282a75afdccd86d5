// SPDX-License-Identifier: BSD-2-Clause
/// Mutations of texts, for the targets' own mutators.
#ifndef FUZZ_MUTATION_H
#define FUZZ_MUTATION_H

#include <random>
#include <string>
#include <string_view>

#include "tsm/protocol/json.h"

namespace fuzz {

class Random {
 public:
  explicit Random(unsigned seed) : engine_(seed) {}
  size_t below(size_t end) { return engine_() % end; }
  bool one_in(size_t n) { return below(n) == 0; }

 private:
  std::minstd_rand engine_;
};

/// What a target's mutator defines: changes an input. One that is longer than `max_len` counts for
/// nothing.
std::string mutate(std::string_view input, size_t max_len, Random &random);

/// What the fuzzer itself does to bytes.
std::string mutate_bytes(std::string_view bytes, size_t max_len);

/// Changes one thing about a JSON text: its bytes, or a member, an element, a name or a value.
std::string mutate_json(std::string_view text, size_t max_len, Random &random);

}  // namespace fuzz

#endif
