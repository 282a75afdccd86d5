// SPDX-License-Identifier: BSD-2-Clause
/// Other libraries at the agent's work, each with its form of the same key.
#ifndef BENCH_RIVALS_H
#define BENCH_RIVALS_H

#include <memory>
#include <string>
#include <vector>

#include "floor.h"
#include "libraries/libraries.h"
#include "tsm/protocol/crypto.h"

namespace bench {

RsaNumbers numbers_of(const tsm::RsaKey &key, bool with_primes);

class Rival {
 public:
  Rival(const JoseLibrary &library, const RsaNumbers &numbers);
  ~Rival() { library_.free_key(key_); }
  Rival(const Rival &) = delete;
  Rival &operator=(const Rival &) = delete;

  // They throw when the library does not do it.
  void verify(const std::string &compact, size_t payload_len) const;
  void verify_with_stored_key(const std::string &compact, size_t payload_len) const;
  std::string sign(const std::string &payload) const;
  std::string encrypt(const std::string &plain) const;
  void decrypt(const std::string &compact, size_t plain_len) const;

 private:
  const JoseLibrary &library_;
  void *key_;
  std::string stored_;
};

/// What a program would call `library` for in an exchange with these parts: to verify, decrypt,
/// encrypt and sign, with a key that is ready and has its primes.
Work same_work(const JoseLibrary &library, const JoseParts &parts);

}  // namespace bench

#endif
