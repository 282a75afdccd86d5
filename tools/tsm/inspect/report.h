// SPDX-License-Identifier: BSD-2-Clause
/// What was found out about a message: facts, and checks with their outcome, in sections.
#ifndef TSM_INSPECT_REPORT_H
#define TSM_INSPECT_REPORT_H

#include <string>
#include <string_view>
#include <vector>

#include "tsm/protocol/json.h"

namespace tsm {

enum class Verdict { kFact, kVerified, kFailed, kNotChecked };

struct Finding {
  Verdict verdict;
  std::string name;
  std::string text;  // of a failure the reason, of what was not checked what is needed for it
};

struct Section {
  std::string title;
  std::vector<Finding> findings = {};
};

class Report {
 public:
  void begin(std::string title) { sections_.push_back({std::move(title)}); }
  void fact(std::string_view name, std::string_view text) { add(Verdict::kFact, name, text); }
  void verified(std::string_view name, std::string_view text) {
    add(Verdict::kVerified, name, text);
  }
  void failed(std::string_view name, std::string_view text) { add(Verdict::kFailed, name, text); }
  void not_checked(std::string_view name, std::string_view text) {
    add(Verdict::kNotChecked, name, text);
  }

  const std::vector<Section> &sections() const { return sections_; }
  bool has_failure() const { return has_failure_; }

 private:
  void add(Verdict verdict, std::string_view name, std::string_view text);

  std::vector<Section> sections_;
  bool has_failure_ = false;
};

/// One line for each finding; the outcomes are coloured for a terminal.
std::string report_text(const Report &report, bool has_colours);
Json report_json(const Report &report);

}  // namespace tsm

#endif
