// SPDX-License-Identifier: BSD-2-Clause
#include <cjson/cJSON.h>

#include <cstdlib>
#include <cstring>

#include "libraries.h"

static cJSON *tree(void *document) {
  return static_cast<cJSON *>(document);
}

static const bench::Added<bench::JsonLibrary> added({
    .name = "cJSON",
    .sets_target = true,
    .parse = [](const std::string &text) -> void * { return cJSON_Parse(text.c_str()); },
    .serialize =
        [](void *document) {
          char *text = cJSON_PrintUnformatted(tree(document));
          const size_t len = std::strlen(text);
          std::free(text);
          return len;
        },
    .copy = [](void *document) -> void * { return cJSON_Duplicate(tree(document), true); },
    .free = [](void *document) { cJSON_Delete(tree(document)); },
});
