// SPDX-License-Identifier: BSD-2-Clause
// The agent's JSON documents against other libraries: a device state document of 200 KiB.
#include "state/json.h"

#include <malloc.h>

#include <limits>
#include <optional>
#include <stdexcept>

#include "groups.h"
#include "inside.h"
#include "libraries/libraries.h"
#include "tsm/crypto.h"
#include "tsm/json.h"

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

// What the process has taken from the C library, under which all of them lie.
size_t heap_in_use() {
  const struct mallinfo2 info = ::mallinfo2();
  return info.uordblks + info.hblkhd;
}

double heap_of(const JsonLibrary &library, const std::string &text) {
  const size_t before = heap_in_use();
  void *document = library.parse(text);
  const size_t with = heap_in_use();
  library.free(document);
  return with > before ? static_cast<double>(with - before) : 0;
}

struct Subject {
  const JsonLibrary *library;
  void *document;
};

using Work = void (*)(const Subject &, const std::string &);

void parse(const Subject &subject, const std::string &text) {
  void *document = subject.library->parse(text);
  if (document == nullptr) throw std::runtime_error("a document was not parsed");
  subject.library->free(document);
}

void serialize(const Subject &subject, const std::string &) {
  if (subject.library->serialize(subject.document) < kDocumentLen) {
    throw std::runtime_error("a document was not serialized");
  }
}

void copy(const Subject &subject, const std::string &) {
  void *document = subject.library->copy(subject.document);
  if (document == nullptr) throw std::runtime_error("a document was not copied");
  subject.library->free(document);
}

// The agent is the first subject. The target is the fastest of those that set it.
void measure(Bench &bench, const std::vector<Subject> &subjects, const std::string &text,
             const char *name, Work work) {
  std::vector<Contestant> contestants;
  for (const Subject &subject : subjects) {
    contestants.push_back({[&subject, &text, work] { work(subject, text); }});
  }
  const Rounds rounds = compare(contestants, bench.effort);
  size_t fastest = 0;
  for (size_t i = 1; i < subjects.size(); ++i) {
    if (!subjects[i].library->sets_target) continue;
    if (fastest == 0 || rounds.seconds(i).median < rounds.seconds(fastest).median) fastest = i;
  }
  for (size_t i = 1; i < subjects.size(); ++i) {
    bench.report.figures.push_back({.group = "JSON, 200 KiB document",
                                    .name = std::string(name) + " / " + subjects[i].library->name,
                                    .value = rounds.ratio(0, i),
                                    .unit = "x",
                                    .target = i == fastest ? at_most(1.0) : Target{},
                                    .detail = time_text(rounds.seconds(0).median) + " / " +
                                              time_text(rounds.seconds(i).median)});
  }
}

void measure_heap(Bench &bench, const std::vector<Subject> &subjects, const std::string &text) {
  std::vector<double> heaps;
  size_t leanest = 0;
  for (const Subject &subject : subjects) {
    heaps.push_back(heap_of(*subject.library, text));
    const size_t i = heaps.size() - 1;
    if (subject.library->sets_target && (leanest == 0 || heaps[i] < heaps[leanest])) leanest = i;
  }
  for (size_t i = 1; i < subjects.size(); ++i) {
    const double ratio = heaps[0] / heaps[i];
    bench.report.figures.push_back(
        {.group = "JSON, 200 KiB document",
         .name = std::string("heap / ") + subjects[i].library->name,
         .value = {ratio, ratio, ratio},
         .unit = "x",
         .target = i == leanest ? at_most(0.5) : Target{},
         .detail = std::to_string(static_cast<size_t>(heaps[0]) >> 10) + " / " +
                   std::to_string(static_cast<size_t>(heaps[i]) >> 10) + " KiB"});
  }
}

}  // namespace

void measure_json(Bench &bench) {
  tee::test::Device device;
  const Inside inside(device);
  const std::string text = make_document();
  std::vector<Subject> subjects = {{&kAgent, nullptr}};
  for (const JsonLibrary &library : known<JsonLibrary>()) subjects.push_back({&library, nullptr});
  measure_heap(bench, subjects, text);
  for (Subject &subject : subjects) {
    subject.document = subject.library->parse(text);
    if (subject.document == nullptr) throw std::runtime_error("a document was not parsed");
  }
  measure(bench, subjects, text, "parse and free", parse);
  measure(bench, subjects, text, "serialize", serialize);
  measure(bench, subjects, text, "copy and free", copy);
  for (const Subject &subject : subjects) subject.library->free(subject.document);
}

}  // namespace bench
