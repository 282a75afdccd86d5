// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/operator_input.h"

#include <filesystem>

#include "common/files.h"
#include "tsm/dsi.h"
#include "tsm/image.h"

namespace tsm {
namespace {

using tools::UsageError;

bool quotes_dsi(MessageId id) {
  return id != MessageId::kGetDeviceState && id != MessageId::kGetTaInfo;
}

std::string read_image(const std::string &file) {
  std::string image = tools::read_file(file);
  const std::optional<Image> parsed = parse_image(image);
  if (!parsed) {
    throw UsageError(file +
                     " has no TA image header: expected an image made by `otrp-tsm image "
                     "pack " +
                     file + " -o IMAGE`");
  }
  if (parsed->has_own_magic && !parsed->digest_matches) {
    throw UsageError(file + " is damaged: its payload is not what its header says");
  }
  return image;
}

std::string text_or_file(const std::string &value) {
  std::error_code ignored;
  const bool is_file = value == "-" || std::filesystem::is_regular_file(value, ignored);
  return is_file ? tools::read_file(value) : value;
}

void check_certificate(MessageId id, const RequestOptions &options,
                       const std::optional<Json> &dsi) {
  if (!options.spcert.empty()) return;
  if (id == MessageId::kUpdateSd && options.renew_aik) {
    throw UsageError("--renew-aik needs --sp-cert: expected the SP's new certificate");
  }
  const bool is_known = dsi && find_aik(*dsi, options.spid);
  if (id == MessageId::kCreateSd && !is_known) {
    throw UsageError("the device does not know service provider \"" + options.spid +
                     "\" yet: expected its certificate in --sp-cert");
  }
}

}  // namespace

Json parse_dsi(const std::string &text) {
  const std::optional<Json> dsi = parse_json(text);
  if (!dsi || !is_dsi_document(*dsi)) {
    throw UsageError("not a device state document: expected what --dsi-out wrote");
  }
  return *dsi;
}

RequestOptions prepare_options(const Arguments &arguments, const std::optional<Json> &dsi) {
  RequestOptions options = arguments.request;
  if (quotes_dsi(arguments.message)) {
    if (!dsi) {
      throw UsageError(
          "the state of the device is not known yet: send get-device-state first, or name a "
          "document of --dsi-out with --dsi");
    }
    options.dsihash = dsi_hash(*dsi);
  }
  if (!arguments.spcert.empty()) options.spcert = text_or_file(arguments.spcert);
  check_certificate(arguments.message, options, dsi);
  if (!arguments.image_file.empty()) options.image = read_image(arguments.image_file);
  return options;
}

}  // namespace tsm
