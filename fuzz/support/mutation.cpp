// SPDX-License-Identifier: BSD-2-Clause
#include "support/mutation.h"

#include <algorithm>
#include <vector>

#include "tsm/crypto.h"

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
    "tid",      "tsm_list", "tsm_pub_key",   "tsmid",        "ver",        "",
};

const char *const kTexts[] = {
    "",
    "true",
    "false",
    "bank",
    "rail",
    "wallet",
    "cards",
    "tickets",
    "tsm1",
    "tsm2",
    "\x01",
    "/",
    "\"",
    "\xC3\xA9",
    "77a11e7a000000000000000000000001",
    "71cce700000000000000000000000002",
};

std::string name(Random &random) {
  return kNames[random.below(std::size(kNames))];
}

Json value(Random &random) {
  switch (random.below(8)) {
    case 0:
      return nullptr;
    case 1:
      return random.one_in(2);
    case 2:
      return static_cast<int64_t>(random.below(5)) - 2;
    case 3:
      return 1e300;
    case 4:
      return Json::array();
    case 5:
      return Json::object();
    case 6:
      return std::string(random.below(200), 'x');
    default:
      return kTexts[random.below(std::size(kTexts))];
  }
}

void collect(Json &node, std::vector<Json *> *nodes) {
  nodes->push_back(&node);
  if (!node.is_structured()) return;
  for (Json &child : node) collect(child, nodes);
}

// Encoded bytes change as bytes, and stay encoded.
void mutate_string(Json *node, Random &random) {
  const std::string text = node->get<std::string>();
  const std::optional<tsm::Bytes> bytes =
      random.one_in(2) ? tsm::base64url_decode(text) : std::nullopt;
  if (bytes && !bytes->empty()) {
    *node = tsm::base64url_encode(mutate_bytes(*bytes, bytes->size() + kMaxGrowth));
  } else {
    *node = mutate_bytes(text, text.size() + kMaxGrowth);
  }
}

void mutate_object(Json *node, Random &random) {
  if (node->empty() || random.one_in(3)) {
    (*node)[name(random)] = value(random);
    return;
  }
  auto member = node->begin();
  std::advance(member, random.below(node->size()));
  const std::string old_name = member.key();
  Json moved = *member;
  if (random.one_in(2)) node->erase(member);
  if (random.one_in(2)) (*node)[name(random)] = std::move(moved);
}

void mutate_array(Json *node, Random &random) {
  if (node->empty() || random.one_in(3)) {
    node->push_back(value(random));
    return;
  }
  const size_t index = random.below(node->size());
  if (random.one_in(2)) {
    node->erase(index);
  } else {
    node->push_back(Json((*node)[index]));
  }
}

void mutate_node(const std::vector<Json *> &nodes, Random &random) {
  Json *node = nodes[random.below(nodes.size())];
  if (random.one_in(6)) {
    *node = value(random);
  } else if (random.one_in(6)) {
    const Json other = *nodes[random.below(nodes.size())];
    *node = other;
  } else if (node->is_string()) {
    mutate_string(node, random);
  } else if (node->is_object()) {
    mutate_object(node, random);
  } else if (node->is_array()) {
    mutate_array(node, random);
  } else {
    *node = value(random);
  }
}

}  // namespace

std::string mutate_bytes(std::string_view bytes, size_t max_len) {
  max_len = std::max<size_t>(max_len, 1);
  std::string work(bytes.substr(0, max_len));
  const size_t len = work.size();
  work.resize(max_len);
  work.resize(LLVMFuzzerMutate(reinterpret_cast<uint8_t *>(work.data()), len, max_len));
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

size_t give(std::string_view bytes, uint8_t *data, size_t max_size) {
  return bytes.copy(reinterpret_cast<char *>(data), max_size);
}

}  // namespace fuzz
