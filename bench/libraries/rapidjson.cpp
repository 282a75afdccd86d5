// SPDX-License-Identifier: BSD-2-Clause
#include <rapidjson/document.h>
#include <rapidjson/stringbuffer.h>
#include <rapidjson/writer.h>

#include "libraries.h"

using rapidjson::Document;

static Document &tree(void *document) {
  return *static_cast<Document *>(document);
}

static const bench::Added<bench::JsonLibrary> added({
    .name = "RapidJSON",
    .sets_target = false,
    .parse = [](const std::string &text) -> void * {
      auto *document = new Document;
      document->Parse(text.data(), text.size());
      return document;
    },
    .serialize =
        [](void *document) {
          rapidjson::StringBuffer text;
          rapidjson::Writer<rapidjson::StringBuffer> writer(text);
          tree(document).Accept(writer);
          return text.GetSize();
        },
    .copy = [](void *document) -> void * {
      auto *copy = new Document;
      copy->CopyFrom(tree(document), copy->GetAllocator());
      return copy;
    },
    .free = [](void *document) { delete &tree(document); },
});
