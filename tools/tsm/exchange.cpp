// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/exchange.h"

#include "common/files.h"
#include "common/result_names.h"
#include "tsm/operator_input.h"

namespace tsm {
namespace {

/// Nothing for a file that is not wanted.
std::optional<tools::OutputFile> open_output(const std::string &path) {
  if (path.empty()) return std::nullopt;
  return tools::OutputFile(path);
}

}  // namespace

MadeRequest make_kept_request(const Arguments &arguments, const Identity &tsm,
                              const std::optional<Json> &dsi, DeviceRecord *record) {
  const RequestOptions options = prepare_options(arguments, dsi);
  MadeRequest made;
  made.text =
      make_request(arguments.message, options, tsm, record->device(), dsi ? &*dsi : nullptr);
  made.sent = read_request(made.text, tsm.key);
  record->add(made.sent);
  return made;
}

std::optional<Json> state_for(MessageId message, const DeviceRecord &record,
                              const std::string &dsi_file) {
  if (message == MessageId::kGetDeviceState) return std::nullopt;
  if (!dsi_file.empty()) return parse_dsi(tools::read_file(dsi_file));
  return record.dsi();
}

Exchange exchange(const Arguments &arguments, const Identity &tsm, Channel *channel,
                  DeviceRecord *record) {
  std::optional<tools::OutputFile> dsi_out = open_output(arguments.dsi_out_file);
  std::optional<tools::OutputFile> image_out = open_output(arguments.image_out_file);
  const std::optional<Json> dsi = state_for(arguments.message, *record, "");
  const MadeRequest request = make_kept_request(arguments, tsm, dsi, record);

  const ChannelAnswer answer = channel->send(message_of(arguments.message), request.text);
  if (answer.response.empty()) {
    record->forget(request.sent);
    throw ChannelError(answer.failure);
  }
  Exchange done = {.response = open_response(answer.response, {.tee_key = record->device().tee_key,
                                                               .tsm_key = tsm.key,
                                                               .dsi = dsi ? &*dsi : nullptr}),
                   .tie = Tie::kUnchecked,
                   .failure = answer.failure};
  tools::keep_or_print(answer.response, [&] {
    done.tie = record->take(done.response, {.named = request.sent});
    if (done.response.dsi_text && dsi_out) dsi_out->write(*done.response.dsi_text);
  });
  if (answer.image && image_out) image_out->write(*answer.image);
  return done;
}

std::string refusal_of(const Response &response) {
  if (!response.error_code) return "";
  return "the device refused " + std::string(response.message->command) + ": " +
         tools::describe_result(*response.error_code);
}

}  // namespace tsm
