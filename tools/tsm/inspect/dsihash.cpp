// SPDX-License-Identifier: BSD-2-Clause
// The hash of a device state, and the ways in which it is computed wrongly.
#include "tsm/inspect/message.h"
#include "tsm/protocol/dsi.h"

namespace tsm {
namespace {

constexpr size_t kHashLen = 64;

struct Variant {
  std::string text;
  std::string what;  // differs from the right way; empty when nothing does
};

std::string joined(std::string_view first, std::string_view second) {
  return std::string(first) + (first.empty() || second.empty() ? "" : ", ") + std::string(second);
}

std::vector<Variant> texts_of(const Json &document) {
  std::vector<Variant> texts = {{serialize_as_device(document), ""},
                                {document.dump(), "slashes not escaped"},
                                {document.dump(2), "white space"}};
  const Json *inner = find_object(document, "dsi");
  if (inner != nullptr) {
    texts.push_back({serialize_as_device(*inner), "inner document"});
    texts.push_back({inner->dump(), "inner document, slashes not escaped"});
  }
  return texts;
}

std::string without_padding(std::string text) {
  while (text.ends_with('=')) text.pop_back();
  return text;
}

std::vector<Variant> encodings_of(std::string_view text) {
  const std::string standard = base64_encode(text);
  const std::string url = base64url_encode(text);
  const std::string padding(standard.size() - without_padding(standard).size(), '=');
  return {{standard, ""},
          {without_padding(standard), "no padding"},
          {url + padding, "URL alphabet"},
          {url, "URL alphabet, no padding"},
          {std::string(text), "no base64"}};
}

/// The first way that leads to `hash`; nothing when none does.
std::optional<std::string> find_way(const std::string &hash, const Json &document) {
  for (const Variant &text : texts_of(document)) {
    for (const Variant &encoding : encodings_of(text.text)) {
      if (hex_encode(sha256(encoding.text)) == hash) return joined(text.what, encoding.what);
    }
  }
  return std::nullopt;
}

bool is_hash(std::string_view text) {
  return text.size() == kHashLen && text.find_first_not_of("0123456789abcdef") == text.npos;
}

}  // namespace

void inspect_dsihash(const std::string &hash, const std::vector<StateAtHand> &states,
                     Report *report) {
  if (!is_hash(hash)) {
    report->failed("dsihash", hash + ": expected 64 lower-case hexadecimal digits");
    return;
  }
  std::string tried;
  for (const StateAtHand &state : states) {
    const std::optional<Json> document = parse_json(state.text);
    const std::optional<std::string> way = document ? find_way(hash, *document) : std::nullopt;
    if (way && way->empty()) return report->verified("dsihash", hash + ", of " + state.name);
    if (way) {
      return report->failed("dsihash", hash + ", of " + state.name +
                                           " computed another way than the device does (" + *way +
                                           "): expected " + dsi_hash(*document));
    }
    if (state.was_named) tried += (tried.empty() ? "" : ", ") + state.name;
  }
  if (tried.empty()) {
    return report->not_checked("dsihash",
                               hash + ": needs the state it is of (--dsi, or the TSM's --home)");
  }
  report->failed("dsihash", hash + ": not of " + tried);
}

}  // namespace tsm
