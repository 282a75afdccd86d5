// SPDX-License-Identifier: BSD-2-Clause
// All else that is to hold of texts and bytes is held by the fuzz target and its corpus.
#include "crypto/base64.h"

#include "support/inside_agent.h"

namespace otrp_test {
namespace {

class Base64 : public InsideAgent {};

using Encoder = char *(const uint8_t *, uint32_t);
using Decoder = uint32_t(const char *, uint8_t **);

std::string encode(Encoder *encoder, const std::string &data) {
  device::Buffer exact(data);
  const tee_ptr<char> text(encoder(exact.data(), len_of(data)));
  return text ? text.get() : "NULL";
}

std::string decode(Decoder *decoder, const std::string &text) {
  secret_bytes bytes;
  bytes.len = decoder(text.c_str(), &bytes.data);
  EXPECT_NE(bytes.data, nullptr);
  return str(bytes);
}

// RFC 4648, section 10
TEST_F(Base64, KnownAnswers) {
  const std::pair<std::string, std::string> cases[] = {
      {"", ""},
      {"f", "Zg=="},
      {"fo", "Zm8="},
      {"foo", "Zm9v"},
      {"foob", "Zm9vYg=="},
      {"fooba", "Zm9vYmE="},
      {"foobar", "Zm9vYmFy"},
  };
  for (const auto &[data, text] : cases) {
    EXPECT_EQ(encode(base64EncodeAddEndZero, data), text);
    EXPECT_EQ(encode(base64urlEncodeAddEndZero, data), text.substr(0, text.find('=')));
    EXPECT_EQ(decode(base64DecodeStringRemoveEndZero, text), data);
  }
}

TEST_F(Base64, NullAndNoMemory) {
  auto *const untouched = reinterpret_cast<uint8_t *>(this);
  uint8_t *bytes = untouched;
  const uint8_t byte = 0;
  EXPECT_EQ(base64EncodeAddEndZero(nullptr, 3), nullptr);
  EXPECT_EQ(base64DecodeStringRemoveEndZero(nullptr, &bytes), 0u);
  EXPECT_EQ(base64urlDecodeStringRemoveEndZeroV2(nullptr, 3, &bytes), 0u);
  EXPECT_EQ(bytes, untouched);
  // Lengths that cannot be met: nothing is read.
  EXPECT_EQ(base64EncodeAddEndZero(&byte, UINT32_MAX), nullptr);
  EXPECT_EQ(base64EncodeAddEndZero(&byte, UINT32_MAX / 4 * 3), nullptr);

  device.fail({}, tee::test::Fault::kAllocation, 1, true);
  EXPECT_EQ(base64urlEncodeAddEndZero(&byte, 1), nullptr);
  EXPECT_EQ(base64DecodeStringRemoveEndZero("QQ", &bytes), 0u);
  EXPECT_EQ(bytes, nullptr);
}

}  // namespace
}  // namespace otrp_test
