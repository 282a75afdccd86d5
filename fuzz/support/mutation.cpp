// SPDX-License-Identifier: BSD-2-Clause
#include "support/mutation.h"

#include <algorithm>
#include <vector>

#include "tsm/protocol/crypto.h"

extern "C" size_t LLVMFuzzerMutate(uint8_t *data, size_t size, size_t max_size);

namespace fuzz {
namespace {

using tsm::Json;

constexpr size_t kMaxGrowth = 64;  // bytes that one mutation of a text may add

const char *const kNames[] = {
    "aik",      "alg",      "changes",       "ciphertext",   "content",    "dsihash",
    "deleteta", "did",      "encrypted_key", "encrypted_ta", "header",     "iv",
    "key",      "name",     "payload",       "protect",      "recipients", "renewteespaik",
    "rid",      "sd",       "sdname",        "signature",    "signature2", "spaiktype",
    "spcert",   "spid",     "ta_version",    "tag",          "taid",       "talist",
    "tid",      "tsm_list", "tsm_pub_key",   "tsmid",        "ver",        ""};

const Json kValues = Json::parse(R"([
    null, true, false, -2, 0, 1, 1e300, [], {}, "", "true", "false", "bank", "rail", "wallet",
    "cards", "tickets", "tsm1", "tsm2", "\u0001", "/", "\"", "\u00e9",
    "77a11e7a000000000000000000000001", "71cce700000000000000000000000002"])");

template <class List>
auto &one_of(List &list, Random &random) {
  return *std::next(std::begin(list), static_cast<ptrdiff_t>(random.below(std::size(list))));
}

void collect(Json &node, std::vector<Json *> *nodes) {
  nodes->push_back(&node);
  if (!node.is_structured()) return;
  for (Json &child : node) collect(child, nodes);
}

// Encoded bytes change as bytes, and stay encoded.
std::string mutate_string(const std::string &text, Random &random) {
  const auto bytes = random.one_in(2) ? tsm::base64url_decode(text) : std::nullopt;
  if (!bytes || bytes->empty()) return mutate_bytes(text, text.size() + kMaxGrowth);
  return tsm::base64url_encode(mutate_bytes(*bytes, bytes->size() + kMaxGrowth));
}

void mutate_object(Json *node, Random &random) {
  if (node->empty() || random.one_in(3)) {
    (*node)[one_of(kNames, random)] = one_of(kValues, random);
    return;
  }
  const auto member = std::next(node->begin(), static_cast<ptrdiff_t>(random.below(node->size())));
  Json moved = *member;
  if (random.one_in(2)) node->erase(member);
  if (random.one_in(2)) (*node)[one_of(kNames, random)] = std::move(moved);
}

void mutate_array(Json *node, Random &random) {
  if (node->empty() || random.one_in(3)) {
    node->push_back(one_of(kValues, random));
  } else if (random.one_in(2)) {
    node->erase(random.below(node->size()));
  } else {
    node->push_back(Json(one_of(*node, random)));
  }
}

void mutate_node(const std::vector<Json *> &nodes, Random &random) {
  Json *node = one_of(nodes, random);
  if (random.one_in(6)) {
    *node = Json(*one_of(nodes, random));
  } else if (node->is_primitive() && (!node->is_string() || random.one_in(6))) {
    *node = one_of(kValues, random);
  } else if (node->is_string()) {
    *node = mutate_string(node->get<std::string>(), random);
  } else if (node->is_object()) {
    mutate_object(node, random);
  } else {
    mutate_array(node, random);
  }
}

}  // namespace

std::string mutate_bytes(std::string_view bytes, size_t max_len) {
  std::string work(bytes.substr(0, max_len));
  const size_t len = work.size();
  work.resize(std::max<size_t>(max_len, 1));
  work.resize(LLVMFuzzerMutate(reinterpret_cast<uint8_t *>(work.data()), len, work.size()));
  return work;
}

std::string mutate_json(std::string_view text, size_t max_len, Random &random) {
  std::optional<Json> document =
      random.one_in(3) ? std::nullopt : tsm::parse_json(text.substr(0, max_len));
  if (!document) return mutate_bytes(text, std::min(max_len, text.size() + kMaxGrowth));
  std::vector<Json *> nodes;
  collect(*document, &nodes);
  mutate_node(nodes, random);
  // The device's own writer keeps bytes that are no UTF-8 and control characters as they are.
  return tsm::serialize_as_device(*document);
}

}  // namespace fuzz

extern "C" size_t LLVMFuzzerCustomMutator(uint8_t *data, size_t size, size_t max_size,
                                          unsigned seed) {
  fuzz::Random random(seed);
  const std::string_view input(reinterpret_cast<const char *>(data), size);
  std::string mutated = random.one_in(8) ? "" : fuzz::mutate(input, max_size, random);
  if (mutated.empty() || mutated.size() > max_size) mutated = fuzz::mutate_bytes(input, max_size);
  return mutated.copy(reinterpret_cast<char *>(data), max_size);
}
