// SPDX-License-Identifier: BSD-2-Clause
// The agent's JSON documents against other libraries: a device state document of 200 KiB.
#include "state/json.h"

#include <memory>
#include <stdexcept>

#include "inside.h"
#include "libraries/libraries.h"
#include "suite.h"
#include "tsm/protocol/crypto.h"
#include "tsm/protocol/json.h"

namespace bench {
namespace {

constexpr size_t kDocumentLen = 200 << 10;

std::string make_document() {
  tsm::Json sds = tsm::Json::array();
  for (size_t i = 0; sds.dump().size() < kDocumentLen; i += 50) {
    for (size_t k = 0; k < 50; ++k) {
      tsm::Json tas = tsm::Json::array();
      for (size_t ta = 0; ta < 2; ++ta) {
        const std::string taid = tsm::hex_encode(tsm::random_bytes(16));
        tas.push_back({{"taid", taid}, {"taname", taid}});
      }
      sds.push_back({{"name", "domain" + std::to_string(i + k)}, {"spid", "sp1"}, {"talist", tas}});
    }
  }
  const tsm::Json aiks = {{{"spaik", tsm::base64url_encode(tsm::random_bytes(267))},
                           {"spaiktype", "RSA"},
                           {"spid", "sp1"}}};
  const tsm::Json tee = {{"sdlist", {{"cnt", sds.size()}, {"sd", sds}}},
                         {"teeaiklist", {{"teeaik", aiks}}}};
  return tsm::Json{{"dsi", {{"tee", tee}}}}.dump();
}

JSON_Value *tree(void *document) {
  return static_cast<JSON_Value *>(document);
}

const JsonLibrary kAgent = {
    .name = "agent",
    .sets_target = false,
    .parse = [](const std::string &text) -> void * { return json_parse_string(text.c_str()); },
    .serialize =
        [](void *document) {
          const json_text text(json_serialize_to_string(tree(document)));
          return text ? strlen(text.get()) : 0;
        },
    .copy = [](void *document) -> void * { return json_value_deep_copy(tree(document)); },
    .free = [](void *document) { json_value_free(tree(document)); },
};

struct Stage {
  Inside inside;
  const std::string text = make_document();
};

/// One library with a document that it has parsed, and a second one for a while.
class Subject {
 public:
  Subject(std::shared_ptr<const Stage> stage, const JsonLibrary &library)
      : stage_(std::move(stage)), library_(library), document_(library.parse(stage_->text)) {
    require(document_ != nullptr, "parse");
  }
  ~Subject() { library_.free(document_); }
  Subject(const Subject &) = delete;
  Subject &operator=(const Subject &) = delete;

  void parse() {
    second_ = library_.parse(stage_->text);
    require(second_ != nullptr, "parse");
  }
  void free() { library_.free(second_); }
  void parse_and_free() {
    parse();
    free();
  }
  void serialize() { require(library_.serialize(document_) >= kDocumentLen, "serialize"); }
  void copy_and_free() {
    second_ = library_.copy(document_);
    require(second_ != nullptr, "copy");
    free();
  }

 private:
  void require(bool passed, const char *what) const {
    if (!passed) throw std::runtime_error(std::string(library_.name) + " did not " + what);
  }

  const std::shared_ptr<const Stage> stage_;
  const JsonLibrary &library_;
  void *document_;
  void *second_ = nullptr;
};

/// The agent against all libraries; the target holds for those that set it.
Comparison libraries(void (Subject::*run)(), void (Subject::*after)(), double target) {
  const auto stage = std::make_shared<const Stage>();
  Comparison comparison;
  const auto add = [&](const JsonLibrary &library) {
    const auto subject = std::make_shared<Subject>(stage, library);
    Contestant contestant = {.name = library.name, .run = [=] { (*subject.*run)(); }};
    if (after != nullptr) contestant.after = [=] { (*subject.*after)(); };
    if (library.sets_target) contestant.target = target;
    comparison.contestants.push_back(contestant);
  };
  add(kAgent);
  for (const JsonLibrary &library : known<JsonLibrary>()) add(library);
  return comparison;
}

}  // namespace

void add_json(Suite &suite) {
  const auto add = [&](const std::string &name, void (Subject::*run)()) {
    suite.compare("json/" + name, [=] { return libraries(run, nullptr, 1.0); });
  };
  suite.compare("json/heap", [] { return libraries(&Subject::parse, &Subject::free, 0.5); },
                {.gauge = Gauge::kHeap, .rounds = 1, .batches = false});
  add("parse and free", &Subject::parse_and_free);
  add("serialize", &Subject::serialize);
  add("copy and free", &Subject::copy_and_free);
}

}  // namespace bench
