// SPDX-License-Identifier: BSD-2-Clause
/// Other libraries for the same work. Each is a source of its own, which takes part when the build
/// finds the library.
#ifndef BENCH_LIBRARIES_H
#define BENCH_LIBRARIES_H

#include <functional>
#include <string>
#include <vector>

namespace bench {

/// Functions that a library's source adds itself to; NULL and false are failures.
struct JsonLibrary {
  const char *name;
  bool sets_target;  // the agent's JSON is held to the best of these
  void *(*parse)(const std::string &text);
  size_t (*serialize)(void *document);  // the length of the compact text, which is freed again
  void *(*copy)(void *document);
  void (*free)(void *document);
};

/// Of a key pair. The last five are all empty, or none is.
struct RsaNumbers {
  std::string n;
  std::string e;
  std::string d;
  std::string p = {};
  std::string q = {};
  std::string dp = {};
  std::string dq = {};
  std::string qi = {};
};

/// Compact serializations of RFC 7515 with RS256, and of RFC 7516 with RSA1_5 and A128CBC-HS256.
struct JoseLibrary {
  const char *name;
  // The agent's time as a part of this library's.
  double verify_target;
  double sign_target;
  double exchange_target;
  /// A key for both directions; the library keeps it.
  void *(*make_key)(const RsaNumbers &numbers);
  /// A key as the library stores it, and back.
  std::string (*store_public_key)(void *key);
  void *(*load_key)(const std::string &stored);
  void (*free_key)(void *key);
  /// The length of the payload; 0 when the signature does not verify.
  size_t (*verify)(const std::string &compact, void *key);
  std::string (*sign)(const std::string &payload, void *key);
  /// The length of the plaintext; 0 when it cannot be had.
  size_t (*decrypt)(const std::string &compact, void *key);
  std::string (*encrypt)(const std::string &plain, void *key);
};

template <class Library>
std::vector<Library> &known() {
  static std::vector<Library> libraries;
  return libraries;
}

template <class Library>
struct Added {
  explicit Added(const Library &library) { known<Library>().push_back(library); }
};

}  // namespace bench

#endif
