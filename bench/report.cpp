// SPDX-License-Identifier: BSD-2-Clause
#include "report.h"

#include <openssl/crypto.h>

#include <cstdio>
#include <nlohmann/json.hpp>

namespace bench {

using Json = nlohmann::ordered_json;

static const char *name_of(Bound bound) {
  switch (bound) {
    case Bound::kAtMost:
      return "at most";
    case Bound::kAtLeast:
      return "at least";
    case Bound::kNone:
      break;
  }
  return "";
}

static Json json_of(const Figure &figure) {
  Json json = {{"group", figure.group},        {"name", figure.name},
               {"value", figure.value.median}, {"low", figure.value.low},
               {"high", figure.value.high},    {"unit", figure.unit},
               {"detail", figure.detail}};
  if (figure.target.bound == Bound::kNone) return json;
  json["bound"] = name_of(figure.target.bound);
  json["target"] = figure.target.value;
  json["met"] = figure.target.bound == Bound::kAtMost ? figure.value.median <= figure.target.value
                                                      : figure.value.median >= figure.target.value;
  return json;
}

static Json json_of(const Curve &curve) {
  Json points = Json::array();
  for (const Curve::Point &point : curve.points) points.push_back({point.num_sds, point.seconds});
  return {{"name", curve.name}, {"points", points}};
}

std::string Report::json(bool quick) const {
  Json document = {{"quick", quick},
                   {"openssl", OpenSSL_version(OPENSSL_VERSION)},
                   {"figures", Json::array()},
                   {"growth", Json::array()}};
  for (const Figure &figure : figures) document["figures"].push_back(json_of(figure));
  for (const Curve &curve : growth) document["growth"].push_back(json_of(curve));
  return document.dump(2) + '\n';
}

std::string time_text(double seconds) {
  char text[32];
  if (seconds < 1e-3) {
    std::snprintf(text, sizeof text, "%.3g us", seconds * 1e6);
  } else {
    std::snprintf(text, sizeof text, "%.3g ms", seconds * 1e3);
  }
  return text;
}

}  // namespace bench
