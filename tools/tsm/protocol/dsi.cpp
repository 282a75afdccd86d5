// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/protocol/dsi.h"

#include <algorithm>
#include <cstdio>
#include <vector>

#include "common/error_line.h"

namespace tsm {
namespace {

const Json *find_path(const Json &value, std::initializer_list<std::string_view> path) {
  const Json *at = &value;
  for (const std::string_view name : path) {
    at = find_object(*at, name);
    if (at == nullptr) return nullptr;
  }
  return at;
}

const Json &list_of(const Json *parent, std::string_view name) {
  static const Json empty = Json::array();
  const Json *list = parent == nullptr ? nullptr : find_array(*parent, name);
  return list == nullptr ? empty : *list;
}

const Json &security_domains(const Json &document) {
  return list_of(find_path(document, {"dsi", "tee", "sdlist"}), "sd");
}

const Json &aiks(const Json &document) {
  return list_of(find_path(document, {"dsi", "tee"}), "teeaiklist");
}

std::string text_of(const Json &object, std::string_view name) {
  const std::string *text = find_string(object, name);
  return text == nullptr ? std::string() : *text;
}

std::optional<Bytes> find_encoded_aik(const Json &document, std::string_view spid) {
  for (const Json &entry : aiks(document)) {
    if (text_of(entry, "spid") == spid) return base64url_decode(text_of(entry, "spaik"));
  }
  return std::nullopt;
}

struct Node {
  std::string text;
  std::vector<Node> children;
};

void draw(const std::vector<Node> &nodes, const std::string &indent, std::string *out) {
  for (const Node &node : nodes) {
    const bool is_last = &node == &nodes.back();
    *out += indent + (is_last ? "`-- " : "|-- ") + node.text + '\n';
    draw(node.children, indent + (is_last ? "    " : "|   "), out);
  }
}

Node sd_node(const Json &sd) {
  Node node = {"SD " + printable(text_of(sd, "name")), {}};
  for (const Json &ta : list_of(&sd, "talist")) {
    node.children.push_back({"TA " + printable(text_of(ta, "taid")), {}});
  }
  return node;
}

Node sp_node(const Json &document, const std::string &spid) {
  const std::optional<RsaKey> aik = find_aik(document, spid);
  Node node = {"SP " + printable(spid) + "  " + (aik ? "AIK " + aik->fingerprint() : "no AIK"), {}};
  for (const Json &sd : security_domains(document)) {
    if (text_of(sd, "spid") == spid) node.children.push_back(sd_node(sd));
  }
  return node;
}

}  // namespace

std::vector<std::string> service_providers(const Json &document) {
  std::vector<std::string> spids;
  for (const Json *list : {&security_domains(document), &aiks(document)}) {
    for (const Json &entry : *list) {
      const std::string spid = text_of(entry, "spid");
      if (std::ranges::find(spids, spid) == spids.end()) spids.push_back(spid);
    }
  }
  return spids;
}

std::vector<Domain> domains_of(const Json &document) {
  std::vector<Domain> domains;
  for (const Json &sd : security_domains(document)) {
    Domain domain = {text_of(sd, "name"), text_of(sd, "spid"), {}};
    for (const Json &ta : list_of(&sd, "talist")) domain.tas.push_back(text_of(ta, "taid"));
    domains.push_back(std::move(domain));
  }
  return domains;
}

std::string dsi_hash_of_text(std::string_view document_text) {
  return hex_encode(sha256(base64_encode(document_text)));
}

std::string dsi_hash(const Json &document) {
  return dsi_hash_of_text(serialize_as_device(document));
}

bool is_dsi_document(const Json &document) {
  const Json *tee = find_path(document, {"dsi", "tee"});
  const Json *sdlist = tee == nullptr ? nullptr : find_object(*tee, "sdlist");
  return sdlist != nullptr && find_array(*sdlist, "sd") != nullptr &&
         find_array(*tee, "teeaiklist") != nullptr;
}

Json parse_dsi(std::string_view text) {
  const std::optional<Json> dsi = parse_json(text);
  if (!dsi || !is_dsi_document(*dsi)) {
    throw tools::UsageError("not a device state document: expected what --dsi-out wrote");
  }
  return *dsi;
}

std::optional<RsaKey> find_aik(const Json &document, std::string_view spid) {
  const std::optional<Bytes> encoded = find_encoded_aik(document, spid);
  return encoded ? RsaKey::from_encoded(*encoded) : std::nullopt;
}

bool has_aik(const Json &document, std::string_view spid) {
  const std::optional<Bytes> encoded = find_encoded_aik(document, spid);
  return encoded && RsaKey::is_encoded(*encoded);
}

std::string dsi_tree(const Json &document) {
  std::vector<Node> nodes;
  for (const std::string &spid : service_providers(document)) {
    nodes.push_back(sp_node(document, spid));
  }
  std::string tree;
  draw(nodes, "", &tree);
  return tree.empty() ? "`-- no service providers\n" : tree;
}

std::string dsi_line(const Json &document) {
  std::vector<std::string> domains;
  for (const Json &sd : security_domains(document)) {
    std::string domain = printable(text_of(sd, "spid") + "/" + text_of(sd, "name"));
    std::vector<std::string> tas;
    for (const Json &ta : list_of(&sd, "talist")) tas.push_back(printable(text_of(ta, "taid")));
    std::ranges::sort(tas);
    for (const std::string &ta : tas) domain += (&ta == &tas.front() ? ": " : ", ") + ta;
    domains.push_back(domain);
  }
  std::ranges::sort(domains);
  std::string line;
  for (const std::string &domain : domains) line += (line.empty() ? "" : "; ") + domain;
  return line.empty() ? "no security domains" : line;
}

std::string printable(std::string_view text) {
  std::string shown;
  for (const char c : text) {
    const auto byte = static_cast<unsigned char>(c);
    if (byte >= 0x20 && byte != 0x7F) {
      shown += c;
      continue;
    }
    char code[sizeof("\\x00")];
    snprintf(code, sizeof(code), "\\x%02x", byte);
    shown += code;
  }
  return shown;
}

}  // namespace tsm
