// SPDX-License-Identifier: BSD-2-Clause
// The token reader against its tokenizer alone, in one pass over an array that is large enough.
#include <vector>

#include "device.h"
#include "groups.h"
#include "inside.h"
#include "state/token_reader.h"

#define JSMN_STATIC
#include <jsmn.h>

namespace bench {

static void measure(Bench &bench, const std::string &request, const std::string &name,
                    const std::string &what) {
  tee::test::Device device;
  const Inside inside(device);
  std::vector<jsmntok_t> tokens(64);
  const Contestant plain = {[&] {
    jsmn_parser parser;
    jsmn_init(&parser);
    keep(jsmn_parse(&parser, request.data(), request.size(), tokens.data(),
                    static_cast<unsigned>(tokens.size())));
  }};
  const Contestant reader = {[&] {
    const jsmn_string text = {request.data(), static_cast<uint32_t>(request.size())};
    const token_object_ptr root(jsmn_init_object(&text));
    const token_object_ptr envelope(jsmn_object_get_object(root.get(), name.c_str()));
    for (const char *member : {"payload", "protect", "signature", "tsmid"}) {
      const slice_ptr slice(jsmn_object_get_string(envelope.get(), member));
      keep(slice);
    }
  }};
  const Rounds rounds = compare({reader, plain}, bench.effort);
  bench.report.figures.push_back({.group = "token reader / jsmn",
                                  .name = "an envelope's members, " + what,
                                  .value = rounds.ratio(0, 1),
                                  .unit = "x",
                                  .detail = time_text(rounds.seconds(0).median) + " / " +
                                            time_text(rounds.seconds(1).median)});
}

void measure_tokens(Bench &bench) {
  FilledDevice device(1);
  const MessageCase deletion = message_case(MessageId::kDeleteTa);
  const MessageCase installation = message_case(MessageId::kInstallTa, 1 << 20);
  Scene &scene = device.scene();
  measure(bench, scene.request(deletion.id, deletion.options), "DeleteTARequest", "DeleteTA");
  measure(bench, scene.request(installation.id, installation.options), "InstallTARequest",
          "InstallTA, 1 MiB");
}

}  // namespace bench
