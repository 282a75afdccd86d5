// SPDX-License-Identifier: BSD-2-Clause
// The token reader against its tokenizer alone, in one pass over an array that is large enough.
#include <memory>

#include "device.h"
#include "inside.h"
#include "state/token_reader.h"

#define JSMN_STATIC
#include <jsmn.h>

namespace bench {
namespace {

struct Request {
  explicit Request(const MessageCase &message)
      : text(filled_device(1)->request(message.id, message.options)) {}

  const std::string text;
  Inside inside;
  std::vector<jsmntok_t> tokens = std::vector<jsmntok_t>(64);
};

Comparison readers(const MessageCase &message) {
  const auto request = std::make_shared<Request>(message);
  const auto pick = [request, name = message.name + "Request"] {
    const jsmn_string text = {request->text.data(), static_cast<uint32_t>(request->text.size())};
    const token_object_ptr root(jsmn_init_object(&text));
    const token_object_ptr envelope(jsmn_object_get_object(root.get(), name.c_str()));
    for (const char *member : {"payload", "protect", "signature", "tsmid"}) {
      const slice_ptr slice(jsmn_object_get_string(envelope.get(), member));
      benchmark::DoNotOptimize(slice.get());
    }
  };
  const auto tokenize = [request] {
    jsmn_parser parser;
    jsmn_init(&parser);
    benchmark::DoNotOptimize(jsmn_parse(&parser, request->text.data(), request->text.size(),
                                        request->tokens.data(),
                                        static_cast<unsigned>(request->tokens.size())));
  };
  return {{{"reader", pick}, {"jsmn", tokenize}}};
}

}  // namespace

void add_tokens(Suite &suite) {
  suite.compare("tokens/an envelope's members, DeleteTA",
                [] { return readers(message_case(MessageId::kDeleteTa)); });
  suite.compare("tokens/an envelope's members, InstallTA, 1 MiB",
                [] { return readers(message_case(MessageId::kInstallTa, 1 << 20)); });
}

}  // namespace bench
