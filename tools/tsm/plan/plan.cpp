// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/plan/plan.h"

#include <algorithm>
#include <filesystem>
#include <functional>
#include <map>

#include "common/files.h"
#include "tsm/plan/located_json.h"
#include "tsm/protocol/image.h"

namespace tsm {
namespace {

using Kind = LocatedJson::Kind;

constexpr size_t kMaxNameLen = 56;  // what is left of an object ID behind the device's prefix
constexpr size_t kTaidLen = 32;

/// What a plan may say only once, and where it was said first.
using Seen = std::map<std::string, size_t>;

class PlanReader {
 public:
  explicit PlanReader(std::string file) : file_(std::move(file)) {}

  Plan read() {
    const LocatedJson root = parse_located_json(tools::read_file(file_), file_);
    const Members members = members_of(root, "a plan", {"domains"}, {"others"});
    Plan plan;
    const LocatedJson &domains = *members.at("domains");
    require(domains, Kind::kArray, "\"domains\"", "a list");
    for (const LocatedJson &domain : domains.elements) plan.domains.push_back(read_domain(domain));
    if (members.contains("others")) plan.deletes_others = read_others(*members.at("others"));
    return plan;
  }

 private:
  using Members = std::map<std::string, const LocatedJson *>;

  [[noreturn]] void refuse(const LocatedJson &at, const std::string &what) const {
    throw error_at(file_, at.line, what);
  }

  void require(const LocatedJson &value, Kind kind, const std::string &what,
               const std::string &wanted) const {
    if (value.kind != kind) refuse(value, what + ": expected " + wanted);
  }

  /// The members of an object that has these and no others.
  Members members_of(const LocatedJson &object, const std::string &what,
                     const std::vector<std::string> &needed,
                     const std::vector<std::string> &optional) const {
    require(object, Kind::kObject, what, "an object");
    Members found;
    for (const auto &[name, value] : object.members) {
      const bool is_known =
          std::ranges::count(needed, name) != 0 || std::ranges::count(optional, name) != 0;
      if (!is_known) refuse(value, what + " has no member \"" + name + "\"");
      if (!found.emplace(name, &value).second) refuse(value, "\"" + name + "\" is there twice");
    }
    for (const std::string &name : needed) {
      if (!found.contains(name)) refuse(object, what + " needs \"" + name + "\"");
    }
    return found;
  }

  /// A text that a device can store and a person can read.
  std::string read_text(const Members &members, const std::string &name) const {
    const LocatedJson &value = *members.at(name);
    require(value, Kind::kText, "\"" + name + "\"", "a text");
    if (value.text.empty()) refuse(value, "\"" + name + "\" is empty");
    const bool is_printable =
        std::ranges::none_of(value.text, [](unsigned char c) { return c < ' ' || c == 0x7F; });
    if (!is_printable) refuse(value, "\"" + name + "\" has a control character");
    return value.text;
  }

  std::string read_name(const Members &members, const std::string &name) const {
    std::string text = read_text(members, name);
    if (text.size() <= kMaxNameLen) return text;
    refuse(*members.at(name), "\"" + name + "\" has " + std::to_string(text.size()) +
                                  " bytes: expected at most " + std::to_string(kMaxNameLen));
  }

  /// What `read` makes of the file that a member names.
  std::string read_file(const Members &members, const std::string &name,
                        const std::function<std::string(const std::string &)> &read) const {
    const std::filesystem::path folder = std::filesystem::path(file_).parent_path();
    try {
      return read(folder / read_text(members, name));
    } catch (const tools::UsageError &error) {
      const std::string what = error.what();
      if (what.starts_with(file_ + ":")) throw;
      refuse(*members.at(name), what);
    }
  }

  void note_first(const LocatedJson &at, const std::string &what, const std::string &name,
                  Seen *seen) const {
    const auto [first, is_first] = seen->emplace(name, at.line);
    if (!is_first) {
      refuse(at, what + " \"" + name + "\" is planned twice, first in line " +
                     std::to_string(first->second));
    }
  }

  PlannedDomain read_domain(const LocatedJson &value) {
    const Members members = members_of(value, "a domain", {"sd", "sp", "cert_file"}, {"apps"});
    PlannedDomain domain = {.sd = read_name(members, "sd"),
                            .sp = read_name(members, "sp"),
                            .spcert = read_file(members, "cert_file", tools::read_file),
                            .apps = {}};
    note_first(*members.at("sd"), "domain", domain.sd, &domains_);
    const auto cert = certs_.emplace(domain.sp, domain.spcert).first;
    if (cert->second != domain.spcert) {
      refuse(*members.at("cert_file"),
             "service provider \"" + domain.sp + "\" has another certificate above");
    }
    if (!members.contains("apps")) return domain;
    require(*members.at("apps"), Kind::kArray, "\"apps\"", "a list");
    for (const LocatedJson &app : members.at("apps")->elements) {
      domain.apps.push_back(read_app(app));
    }
    return domain;
  }

  PlannedApp read_app(const LocatedJson &value) {
    const Members members = members_of(value, "an app", {"taid", "version", "image"}, {});
    PlannedApp app = {.taid = read_text(members, "taid"),
                      .version = read_text(members, "version"),
                      .image = read_file(members, "image", read_image_file)};
    if (app.taid.size() != kTaidLen) {
      refuse(*members.at("taid"), "\"taid\" has " + std::to_string(app.taid.size()) +
                                      " characters: expected " + std::to_string(kTaidLen));
    }
    note_first(*members.at("taid"), "app", app.taid, &apps_);
    return app;
  }

  bool read_others(const LocatedJson &value) const {
    if (value.kind == Kind::kText && value.text == "keep") return false;
    if (value.kind == Kind::kText && value.text == "delete") return true;
    refuse(value, R"("others": expected "keep" or "delete")");
  }

  std::string file_;
  Seen domains_;
  Seen apps_;
  std::map<std::string, std::string> certs_;  // of SPs
};

}  // namespace

Plan read_plan(const std::string &file) {
  return PlanReader(file).read();
}

}  // namespace tsm
