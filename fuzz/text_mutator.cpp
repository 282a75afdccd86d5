// SPDX-License-Identifier: BSD-2-Clause
// For inputs with a JSON text in them, from the first brace to a NUL or the end.
#include "support/mutation.h"

std::string fuzz::mutate(std::string_view input, size_t max_len, Random &random) {
  const size_t at = input.find('{');
  if (at == std::string_view::npos || random.one_in(3)) return mutate_bytes(input, max_len);
  const std::string_view text = input.substr(at, input.find('\0', at) - at);
  return std::string(input.substr(0, at)) + mutate_json(text, max_len, random) +
         std::string(input.substr(at + text.size()));
}
