// SPDX-License-Identifier: BSD-2-Clause
#include "device/broker/device_url.h"

#include <algorithm>
#include <cstdio>

#include "common/error_line.h"

namespace broker {
namespace {

constexpr std::string_view kSchemes[] = {"http://", "https://"};

bool is_unreserved(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
         std::string_view("-._~").find(c) != std::string_view::npos;
}

/// RFC 3986, section 2.1.
std::string escaped(std::string_view text) {
  std::string out;
  for (const char c : text) {
    char escape[sizeof("%NN")];
    snprintf(escape, sizeof(escape), "%%%02X", static_cast<unsigned char>(c));
    out += is_unreserved(c) ? std::string(1, c) : escape;
  }
  return out;
}

/// Where the path begins.
size_t end_of_host(std::string_view url) {
  const auto scheme = std::ranges::find_if(
      kSchemes, [&](std::string_view known) { return url.starts_with(known); });
  if (scheme == std::end(kSchemes)) return 0;
  const size_t end = std::min(url.find('/', scheme->size()), url.size());
  return end == scheme->size() ? 0 : end;
}

}  // namespace

std::string device_url(std::string url, std::string_view device_id) {
  if (end_of_host(url) == 0 || url.find_first_of("?# ") != url.npos) {
    throw tools::UsageError("bad URL \"" + url +
                            "\": expected http://... or https://..., without ? and #");
  }
  const std::string last = "/" + escaped(device_id);
  if (std::string_view(url).substr(end_of_host(url)).ends_with(last)) return url;
  if (url.ends_with('/')) url.pop_back();
  return url + last;
}

}  // namespace broker
