// SPDX-License-Identifier: BSD-2-Clause
// For targets whose inputs are a JSON text up to a NUL, and perhaps more behind it.
#include "support/mutation.h"
#include "support/require.h"

using namespace fuzz;

extern "C" size_t LLVMFuzzerCustomMutator(uint8_t *data, size_t size, size_t max_size,
                                          unsigned seed) {
  Random random(seed);
  const std::string_view input = as_view(data, size);
  if (random.one_in(3)) return give(mutate_bytes(input, max_size), data, max_size);
  const std::string_view text = input.substr(0, input.find('\0'));
  const std::string rest(input.substr(text.size()));
  return give(mutate_json(text, max_size, random) + rest, data, max_size);
}
