// SPDX-License-Identifier: BSD-2-Clause
/// Finding the primes of RSA keys would be half the work of short tests: where $OTRP_TEST_KEYS
/// names a folder, one process makes a key and the others find it there.
#ifndef OTRP_TEST_KEPT_KEY_H
#define OTRP_TEST_KEPT_KEY_H

#include <cstdlib>
#include <string>

#include "common/files.h"
#include "tsm/protocol/crypto.h"

namespace otrp_test {

/// Empty where keys are not kept.
inline std::string key_folder() {
  const char *folder = std::getenv("OTRP_TEST_KEYS");
  return folder != nullptr ? folder : "";
}

inline tsm::RsaKey kept_key(const std::string &name) {
  if (key_folder().empty()) return tsm::RsaKey::generate();
  const std::string file = key_folder() + "/" + tsm::hex_encode(tsm::sha256(name)) + ".pem";
  if (tools::file_exists(file)) return tsm::RsaKey::from_pem(tools::read_file(file)).value();
  tsm::RsaKey key = tsm::RsaKey::generate();
  tools::write_file(file, key.private_pem());
  return key;
}

}  // namespace otrp_test

#endif
