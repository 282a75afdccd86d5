// SPDX-License-Identifier: BSD-2-Clause
#include "crypto/base64.h"

#include <algorithm>
#include <random>

#include "support/inside_agent.h"

namespace otrp_test {
namespace {

class Base64 : public InsideAgent {};

using Encoder = char *(const uint8_t *, uint32_t);
using Decoder = uint32_t(const char *, uint8_t **);

std::string encode(Encoder *encoder, const std::string &data) {
  // A copy of exact size, so that a byte too far is seen.
  const auto exact = std::make_unique<uint8_t[]>(data.size());
  std::copy(data.begin(), data.end(), exact.get());
  const tee_ptr<char> text(encoder(exact.get(), len_of(data)));
  return text ? text.get() : "NULL";
}

std::string decode(Decoder *decoder, const std::string &text) {
  secret_bytes bytes;
  bytes.len = decoder(text.c_str(), &bytes.data);
  EXPECT_NE(bytes.data, nullptr);
  return str(bytes);
}

std::string from_slice(const std::string &text) {
  const auto exact = std::make_unique<char[]>(text.size());
  std::copy(text.begin(), text.end(), exact.get());
  secret_bytes bytes;
  bytes.len = base64urlDecodeStringRemoveEndZeroV2(exact.get(), len_of(text), &bytes.data);
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

TEST_F(Base64, AgreesWithTheTsmOnRandomBytesOfEveryLength) {
  std::mt19937 random(1);
  for (size_t len = 0; len < 200; ++len) {
    std::string data(len, 0);
    for (char &c : data) c = static_cast<char>(random());
    const std::string text = tools::base64_encode(data);
    const std::string url = tools::base64url_encode(data);
    EXPECT_EQ(encode(base64EncodeAddEndZero, data), text);
    EXPECT_EQ(encode(base64urlEncodeAddEndZero, data), url);
    EXPECT_EQ(decode(base64DecodeStringRemoveEndZero, text), data);
    EXPECT_EQ(from_slice(url), data);
  }
}

TEST_F(Base64, DecodersSkipWhatIsNotTheirs) {
  const std::pair<const char *, const char *> cases[] = {
      {"QQ==QQ==", "\x41\x04\x10"},
      {"QU\nJD", "ABC"},
      {"QR", "A"},
      {"Q", ""},
      {"QUJDR", "ABC"},
      {"QUJDQUJDQUJDQUJDQUJD\r\nQUJDQUJDQUJDQUJDQUJDQUJD QQ", "ABCABCABCABCABCABCABCABCABCABCABCA"},
  };
  for (const auto &[text, bytes] : cases) {
    EXPECT_EQ(decode(base64DecodeStringRemoveEndZero, text), bytes) << text;
    EXPECT_EQ(decode(base64urlDecodeStringRemoveEndZero, text), bytes) << text;
    EXPECT_EQ(from_slice(text), bytes) << text;
  }
  EXPECT_EQ(from_slice(std::string("QU\0JD", 5)), "ABC");
  secret_bytes text;
  text.len = base64urlDecodeStringAddEndZeroV2("QUJDRA==", 4, &text.data);
  EXPECT_EQ(text.len, 3u);
  EXPECT_STREQ(reinterpret_cast<char *>(text.data), "ABC");
}

TEST_F(Base64, EveryByteHasItsValueOrIsSkipped) {
  const std::string symbols = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/-_";
  for (int byte = 1; byte < 256; ++byte) {
    SCOPED_TRACE(byte);
    const std::string symbol(1, static_cast<char>(byte));
    const size_t at = symbols.find(symbol);
    const auto value = static_cast<char>(at < 64 ? at << 2 : (at - 2) << 2);
    const std::string decoded = at == std::string::npos ? "" : std::string(1, value);
    EXPECT_EQ(from_slice(symbol + "A"), decoded);
    EXPECT_EQ(decode(base64DecodeStringRemoveEndZero, symbol + "A"), at < 64 ? decoded : "");
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

TEST_F(Base64, PiecesGiveWhatTheWholeGives) {
  std::mt19937 random(7);
  const std::string characters = "ABCDwxyz0189-_+/=.\n ";
  for (int i = 0; i < 2000; ++i) {
    std::string text;
    for (size_t n = random() % 120; n > 0; --n) text += characters[random() % characters.size()];
    std::string bytes(text.size() + 3, 0);
    uint32_t num_bytes = 0;
    std::string piece;
    for (size_t offset = 0; offset < text.size();) {
      const size_t taken = std::min<size_t>(1 + random() % 40, text.size() - offset);
      piece += text.substr(offset, taken);
      offset += taken;
      uint32_t len = len_of(piece);
      num_bytes += base64urlDecodePiece(piece.data(), &len, offset == text.size(),
                                        reinterpret_cast<uint8_t *>(bytes.data()) + num_bytes);
      ASSERT_LE(len, 3u);
      piece.resize(len);
    }
    EXPECT_EQ(bytes.substr(0, num_bytes), from_slice(text)) << text;
  }
}

}  // namespace
}  // namespace otrp_test
