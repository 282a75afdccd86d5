// SPDX-License-Identifier: BSD-2-Clause
#include <json-c/json.h>

#include <cstring>

#include "libraries.h"

static json_object *tree(void *document) {
  return static_cast<json_object *>(document);
}

static const bench::Added<bench::JsonLibrary> added({
    .name = "json-c",
    .sets_target = true,
    .parse = [](const std::string &text) -> void * { return json_tokener_parse(text.c_str()); },
    // The text stays with the document.
    .serialize =
        [](void *document) {
          return std::strlen(
              json_object_to_json_string_ext(tree(document), JSON_C_TO_STRING_PLAIN));
        },
    .copy = [](void *document) -> void * {
      json_object *copy = nullptr;
      return json_object_deep_copy(tree(document), &copy, nullptr) == 0 ? copy : nullptr;
    },
    .free = [](void *document) { json_object_put(tree(document)); },
});
