// SPDX-License-Identifier: BSD-2-Clause
/// Pieces of work on bytes, as functions that do them once more each time: straight in OpenSSL,
/// with contexts made beforehand. What they work on has the lengths that they are told, and nothing
/// else of the real texts.
#ifndef BENCH_WORKS_H
#define BENCH_WORKS_H

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <vector>

namespace bench {

using Work = std::function<void()>;

constexpr size_t kAesBlockLen = 16;
constexpr size_t kCekLen = 32;
constexpr size_t kDigestLen = 32;

/// Throws unless an OpenSSL function succeeded.
void require(int result);

/// What is worked on, bytes and base64 alike, and where results go.
struct Scratch {
  std::vector<uint8_t> in;
  std::vector<uint8_t> out;
};
Scratch &scratch();

Work in_order(std::vector<Work> works);

Work decode(size_t text_len);
Work encode(size_t len);
Work draw(size_t len);  // of random bytes
Work digest(size_t len);
Work hmac(size_t len);
Work aes(size_t len, bool encrypt);

/// As TEE_CipherUpdate gets it.
Work decrypt_blocks(size_t len);

/// A zero-filled block of the heap whose content ends in the output buffer and is wiped.
Work move(size_t len);
Work wipe_output(size_t len);

/// A look at each character, and a pass of the tokenizer over what is not in long words.
Work reading_of(std::string text);

}  // namespace bench

#endif
