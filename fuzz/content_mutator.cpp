// SPDX-License-Identifier: BSD-2-Clause
#include "support/mutation.h"
#include "support/require.h"

using namespace fuzz;

extern "C" size_t LLVMFuzzerCustomMutator(uint8_t *data, size_t size, size_t max_size,
                                          unsigned seed) {
  Random random(seed);
  const std::string_view input = as_view(data, size);
  if (size < 2 || random.one_in(8)) return give(mutate_bytes(input, max_size), data, max_size);
  const std::string_view rest = input.substr(1);
  const std::string_view content = rest.substr(0, rest.find('\0'));
  const std::string image(rest.substr(content.size()));
  std::string mutated = input[0] + mutate_json(content, max_size - 1, random) + image;
  return give(mutated, data, max_size);
}
