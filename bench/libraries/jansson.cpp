// SPDX-License-Identifier: BSD-2-Clause
#include <jansson.h>

#include <cstdlib>
#include <cstring>

#include "libraries.h"

static json_t *tree(void *document) {
  return static_cast<json_t *>(document);
}

static const bench::Added<bench::JsonLibrary> added({
    .name = "Jansson",
    .sets_target = true,
    .parse = [](const std::string &text) -> void * {
      return json_loadb(text.data(), text.size(), 0, nullptr);
    },
    .serialize =
        [](void *document) {
          char *text = json_dumps(tree(document), JSON_COMPACT);
          const size_t len = std::strlen(text);
          std::free(text);
          return len;
        },
    .copy = [](void *document) -> void * { return json_deep_copy(tree(document)); },
    .free = [](void *document) { json_decref(tree(document)); },
});
