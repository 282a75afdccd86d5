// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/operator_input.h"

#include <filesystem>

#include "common/files.h"
#include "tsm/image.h"

namespace tsm {
namespace {

using tools::UsageError;

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

}  // namespace

Order read_order(const Arguments &arguments) {
  Order order = {arguments.message, arguments.request};
  if (!arguments.spcert.empty()) order.options.spcert = text_or_file(arguments.spcert);
  if (!arguments.image_file.empty()) order.options.image = read_image(arguments.image_file);
  return order;
}

}  // namespace tsm
