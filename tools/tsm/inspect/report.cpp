// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/inspect/report.h"

#include <algorithm>

#include "tsm/protocol/dsi.h"

namespace tsm {
namespace {

struct Look {
  const char *word;
  const char *colour;
};

constexpr size_t kWordWidth = 12;
constexpr size_t kNameWidth = 14;
constexpr char kPlain[] = "\x1b[0m";

Look look_of(Verdict verdict) {
  switch (verdict) {
    case Verdict::kVerified:
      return {"verified", "\x1b[32m"};
    case Verdict::kFailed:
      return {"FAILED", "\x1b[31;1m"};
    case Verdict::kNotChecked:
      return {"not checked", "\x1b[33m"};
    case Verdict::kFact:
      break;
  }
  return {"", ""};
}

std::string padded(std::string text, size_t width) {
  if (text.size() < width) text.resize(width, ' ');
  return text;
}

std::string finding_line(const Finding &finding, bool has_colours) {
  const Look look = look_of(finding.verdict);
  const std::string word = padded(look.word, kWordWidth);
  const bool is_coloured = has_colours && *look.colour != '\0';
  return "  " + (is_coloured ? look.colour + word + kPlain : word) +
         padded(printable(finding.name), kNameWidth) + "  " + printable(finding.text) + "\n";
}

Json finding_json(const Finding &finding) {
  Json json = {{"name", finding.name}};
  if (finding.verdict != Verdict::kFact) json["check"] = look_of(finding.verdict).word;
  json["text"] = finding.text;
  return json;
}

}  // namespace

void Report::add(Verdict verdict, std::string_view name, std::string_view text) {
  if (sections_.empty()) begin("");
  sections_.back().findings.push_back({verdict, std::string(name), std::string(text)});
  has_failure_ = has_failure_ || verdict == Verdict::kFailed;
}

std::string report_text(const Report &report, bool has_colours) {
  std::string text;
  for (const Section &section : report.sections()) {
    text += printable(section.title) + "\n";
    for (const Finding &finding : section.findings) text += finding_line(finding, has_colours);
  }
  return text;
}

Json report_json(const Report &report) {
  Json sections = Json::array();
  for (const Section &section : report.sections()) {
    Json findings = Json::array();
    for (const Finding &finding : section.findings) findings.push_back(finding_json(finding));
    sections.push_back({{"title", section.title}, {"findings", findings}});
  }
  return sections;
}

}  // namespace tsm
