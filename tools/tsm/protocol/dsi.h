// SPDX-License-Identifier: BSD-2-Clause
/// The device state information: {"dsi": {"tfwdata", "tee": {..., "sdlist", "teeaiklist"}}}.
///
/// Functions that read a document take any JSON and pass over what is not as it should be.
#ifndef TSM_PROTOCOL_DSI_H
#define TSM_PROTOCOL_DSI_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tsm/protocol/crypto.h"
#include "tsm/protocol/json.h"

namespace tsm {

/// The "dsihash" of a document's text as the device made it.
std::string dsi_hash_of_text(std::string_view document_text);

/// The same of a parsed document, however the text it came from was laid out.
std::string dsi_hash(const Json &document);

/// Whether the document has its two lists.
bool is_dsi_document(const Json &document);

/// Reads a document as --dsi-out writes it; throws tools::UsageError.
Json parse_dsi(std::string_view text);

/// SPs in the order in which the device names them first, by a domain or by an AIK.
std::vector<std::string> service_providers(const Json &document);

/// A security domain, and the TAs in it.
struct Domain {
  std::string name;
  std::string spid;
  std::vector<std::string> tas;  // their IDs
};

/// The domains in the order of the document.
std::vector<Domain> domains_of(const Json &document);

/// The AIK of a service provider; nothing when the device lists none, or no RSA key.
std::optional<RsaKey> find_aik(const Json &document, std::string_view spid);
bool has_aik(const Json &document, std::string_view spid);  // without making the key

/// The document as a tree of lines: SPs, their AIK fingerprints, security domains, TAs.
std::string dsi_tree(const Json &document);

/// What the device holds, in one line: `bank/wallet: TA, TA; bank/cards`.
std::string dsi_line(const Json &document);

/// `text` fit for a terminal: control characters shown as `\xNN`.
std::string printable(std::string_view text);

}  // namespace tsm

#endif
