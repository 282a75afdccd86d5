// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/cli/exchange.h"

#include "common/files.h"
#include "tsm/protocol/dsi.h"

namespace tsm {
namespace {

using tools::UsageError;

/// Nothing for a file that is not wanted.
std::optional<tools::OutputFile> open_output(const std::string &path) {
  if (path.empty()) return std::nullopt;
  return tools::OutputFile(path);
}

struct Outputs {
  explicit Outputs(const OutputNames &names)
      : dsi(open_output(names.dsi)), image(open_output(names.image)) {}

  std::optional<tools::OutputFile> dsi;
  std::optional<tools::OutputFile> image;
};

void check_certificate(const Order &order, const std::optional<Json> &dsi) {
  const RequestOptions &options = order.options;
  if (!options.spcert.empty()) return;
  if (order.message == MessageId::kUpdateSd && options.renew_aik) {
    throw UsageError("--renew-aik needs --sp-cert: expected the SP's new certificate");
  }
  const bool is_known = dsi && find_aik(*dsi, options.spid);
  if (order.message == MessageId::kCreateSd && !is_known) {
    throw UsageError("the device does not know service provider \"" + options.spid +
                     "\" yet: expected its certificate in --sp-cert");
  }
}

/// What the order says, and what the device's state adds to it.
RequestOptions options_for(const Order &order, const std::optional<Json> &dsi) {
  RequestOptions options = order.options;
  if (quotes_dsi(order.message)) {
    if (!dsi) {
      throw UsageError(
          "the state of the device is not known yet: send get-device-state first, or name a "
          "document of --dsi-out with --dsi");
    }
    options.dsihash = dsi_hash(*dsi);
  }
  check_certificate(order, dsi);
  return options;
}

/// Sends the request, and takes and keeps its answer.
Exchange ask(const Order &order, const MadeRequest &request, const ResponseKeys &keys,
             Outputs *outputs, Channel *channel, DeviceRecord *record) {
  const ChannelAnswer answer =
      channel->send(message_of(order.message), request.text, outputs->image.has_value());
  if (answer.response.empty()) throw ChannelError(answer.failure, answer.code);
  Exchange done = {.response = open_response(answer.response, keys),
                   .tie = Tie::kUnchecked,
                   .failure = answer.failure,
                   .image = answer.image};
  tools::keep_or_print(answer.response, [&] {
    done.tie = record->take(done.response, {.named = request.sent});
    if (done.response.dsi_text && outputs->dsi) outputs->dsi->write(*done.response.dsi_text);
  });
  return done;
}

void keep_image(const Order &order, tools::OutputFile *file, Exchange *done) {
  if (done->image && *done->image != order.options.image) {
    throw NotVerified("the TA image that the device handed back is not the one that it was sent");
  }
  if (done->image) {
    file->write(*done->image);
  } else if (done->failure.empty() && !done->response.error_code) {
    done->failure = "the device handed back no TA image: the file for it is not written";
  }
}

}  // namespace

MadeRequest make_kept_request(const Order &order, const Identity &tsm,
                              const std::optional<Json> &dsi, DeviceRecord *record) {
  MadeRequest made;
  made.text = make_request(order.message, options_for(order, dsi), tsm, record->device(),
                           dsi ? &*dsi : nullptr);
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

Exchange exchange(const Order &order, const Identity &tsm, Channel *channel, DeviceRecord *record,
                  const OutputNames &outputs) {
  Outputs files(outputs);
  const std::optional<Json> dsi = state_for(order.message, *record, "");
  const MadeRequest request = make_kept_request(order, tsm, dsi, record);
  const ResponseKeys keys = {
      .tee_key = record->device().tee_key, .tsm_key = tsm.key, .dsi = dsi ? &*dsi : nullptr};
  std::optional<Exchange> done;
  try {
    done = ask(order, request, keys, &files, channel, record);
  } catch (const ChannelError &) {
    record->forget(request.sent);  // nobody will bring its answer any more
    throw;
  } catch (const NotVerified &) {
    record->forget(request.sent);
    throw;
  }
  if (files.image) keep_image(order, &*files.image, &*done);
  return *done;
}

}  // namespace tsm
