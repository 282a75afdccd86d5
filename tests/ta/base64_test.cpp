// SPDX-License-Identifier: BSD-2-Clause
#include "crypto/base64.h"

#include <openssl/evp.h>

#include <algorithm>
#include <random>

#include "support/inside_agent.h"
#include "ta/allocation_sweep.h"

namespace otrp_test {
namespace {

class Base64 : public InsideAgent {};

uint32_t len_of(const std::string &s) {
  return static_cast<uint32_t>(s.size());
}

template <class Encoder>
std::string encode(Encoder encoder, const std::string &data) {
  // A copy of exact size, so that a byte too far is seen.
  const std::vector<uint8_t> exact(data.begin(), data.end());
  static const uint8_t kNothing = 0;
  const tee_ptr<char> text(encoder(exact.empty() ? &kNothing : exact.data(), len_of(data)));
  return text ? text.get() : "NULL";
}

std::string standard(const std::string &data) {
  return encode(base64EncodeAddEndZero, data);
}

std::string url(const std::string &data) {
  return encode(base64urlEncodeAddEndZero, data);
}

std::string from_slice(const std::string &text) {
  const std::vector<char> exact(text.begin(), text.end());
  static const char kNothing = 0;
  secret_bytes bytes;
  bytes.len = base64urlDecodeStringRemoveEndZeroV2(exact.empty() ? &kNothing : exact.data(),
                                                   len_of(text), &bytes.data);
  return str(bytes);
}

template <class Decoder>
std::string decode(Decoder decoder, const std::string &text) {
  secret_bytes bytes;
  bytes.len = decoder(text.c_str(), &bytes.data);
  EXPECT_NE(bytes.data, nullptr);
  return str(bytes);
}

std::string from_standard(const std::string &text) {
  return decode(base64DecodeStringRemoveEndZero, text);
}

std::string from_url(const std::string &text) {
  return decode(base64urlDecodeStringRemoveEndZero, text);
}

// RFC 4648, section 10
TEST_F(Base64, KnownAnswers) {
  const std::pair<const char *, const char *> kCases[] = {
      {"", ""},
      {"f", "Zg=="},
      {"fo", "Zm8="},
      {"foo", "Zm9v"},
      {"foob", "Zm9vYg=="},
      {"fooba", "Zm9vYmE="},
      {"foobar", "Zm9vYmFy"},
  };
  for (const auto &[data, text] : kCases) {
    EXPECT_EQ(standard(data), text);
    EXPECT_EQ(from_standard(text), data);
    const std::string unpadded(text, std::find(text, text + strlen(text), '='));
    EXPECT_EQ(url(data), unpadded);
    EXPECT_EQ(from_url(unpadded), data);
  }
}

TEST_F(Base64, AgreesWithOpenSslOnRandomBytesOfEveryLength) {
  std::mt19937 random(1);
  for (size_t len = 0; len < 200; ++len) {
    std::string data(len, 0);
    for (char &c : data) c = static_cast<char>(random());
    std::string expected(4 * len / 3 + 5, 0);
    const int expected_len = EVP_EncodeBlock(reinterpret_cast<uint8_t *>(expected.data()), u8(data),
                                             static_cast<int>(len));
    expected.resize(static_cast<size_t>(expected_len));
    EXPECT_EQ(standard(data), expected);
    EXPECT_EQ(from_standard(expected), data);
    std::replace(expected.begin(), expected.end(), '+', '-');
    std::replace(expected.begin(), expected.end(), '/', '_');
    expected.resize(std::min(expected.find('='), expected.size()));
    EXPECT_EQ(url(data), expected);
    EXPECT_EQ(from_slice(expected), data);
  }
}

struct LenientCase {
  const char *name;
  std::string text;
  std::string from_standard;
  std::string from_url;
};

TEST_F(Base64, DecodersSkipWhatIsNotTheirs) {
  const LenientCase kCases[] = {
      {"PaddingInTheMiddle", "QQ==QQ==", "\x41\x04\x10", "\x41\x04\x10"},
      {"LineFeed", "QU\nJD", "ABC", "ABC"},
      {"BitsLeftOver", "QR", "A", "A"},
      {"OneCharacterAlone", "Q", "", ""},
      {"OneCharacterMore", "QUJDR", "ABC", "ABC"},
      {"UrlAlphabet", "-_8", "", "\xFB\xFF"},
      {"StandardAlphabet", "+/8", "\xFB\xFF", "\xFB\xFF"},
      {"Mixture", "+_8", "\xFB", "\xFB\xFF"},
      {"NothingValid", "\x80\xFF@[`{:,.", "", ""},
      {"InALaterBlock", "QUJDQUJDQUJDQUJDQUJD\r\nQUJDQUJDQUJDQUJDQUJDQUJD QQ",
       "ABCABCABCABCABCABCABCABCABCABCABCA", "ABCABCABCABCABCABCABCABCABCABCABCA"},
  };
  for (const auto &c : kCases) {
    SCOPED_TRACE(c.name);
    EXPECT_EQ(from_standard(c.text), c.from_standard);
    EXPECT_EQ(from_url(c.text), c.from_url);
    EXPECT_EQ(from_slice(c.text), c.from_url);
  }
  EXPECT_EQ(from_slice(std::string("QU\0JD", 5)), "ABC");
  secret_bytes first;
  first.len = base64urlDecodeStringRemoveEndZeroV2("QUJDRA==", 4, &first.data);
  EXPECT_EQ(str(first), "ABC");
  secret_bytes text;
  text.len = base64urlDecodeStringAddEndZeroV2("QUJD", 4, &text.data);
  EXPECT_EQ(text.len, 3u);
  EXPECT_STREQ(reinterpret_cast<char *>(text.data), "ABC");
}

TEST_F(Base64, EveryByteHasItsValueOrIsSkipped) {
  const std::string kSymbols = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/-_";
  for (int byte = 1; byte < 256; ++byte) {
    SCOPED_TRACE(byte);
    const std::string symbol(1, static_cast<char>(byte));
    const size_t at = kSymbols.find(symbol);
    const auto value = static_cast<char>(at < 64 ? at << 2 : (at - 2) << 2);
    const std::string decoded = at == std::string::npos ? "" : std::string(1, value);
    EXPECT_EQ(from_slice(symbol + "A"), decoded);
    EXPECT_EQ(from_standard(symbol + "A"), at < 64 ? decoded : "");
  }
}

TEST_F(Base64, NullAndNoMemory) {
  auto *const untouched = reinterpret_cast<uint8_t *>(this);
  uint8_t *bytes = untouched;
  EXPECT_EQ(base64EncodeAddEndZero(nullptr, 3), nullptr);
  EXPECT_EQ(base64DecodeStringRemoveEndZero(nullptr, &bytes), 0u);
  EXPECT_EQ(base64urlDecodeStringRemoveEndZeroV2(nullptr, 3, &bytes), 0u);
  EXPECT_EQ(bytes, untouched);
  EXPECT_EQ(lines_of(log).size(), 0u);
  EXPECT_EQ(base64urlEncodeAddEndZero(nullptr, 3), nullptr);

  // Lengths that cannot be met: nothing is read.
  const uint8_t byte = 0;
  EXPECT_EQ(base64EncodeAddEndZero(&byte, UINT32_MAX), nullptr);
  EXPECT_EQ(base64EncodeAddEndZero(&byte, UINT32_MAX / 4 * 3), nullptr);
  device.fail({}, tee::test::Fault::kAllocation, 1, true);
  EXPECT_EQ(base64urlEncodeAddEndZero(&byte, 1), nullptr);
  EXPECT_EQ(base64DecodeStringRemoveEndZero("QQ", &bytes), 0u);
  EXPECT_EQ(bytes, nullptr);
  EXPECT_EQ(lines_of(log), (std::vector<std::string>{
                               "base64urlEncodeAddEndZero: bad parameter",
                               "base64urlEncodeAddEndZero: bad parameter",
                               "base64DecodeStringRemoveEndZero: decode base64 but not memory"}));
}

TEST_F(Base64, PiecesGiveWhatTheWholeGives) {
  std::mt19937 random(7);
  const std::string characters = "ABCDwxyz0189-_+/=.\n ";
  for (int i = 0; i < 2000; ++i) {
    std::string text;
    for (size_t n = random() % 120; n > 0; --n) text += characters[random() % characters.size()];
    secret_bytes whole;
    whole.len = base64urlDecodeStringRemoveEndZeroV2(
        text.data(), static_cast<uint32_t>(text.size()), &whole.data);

    std::string bytes(text.size() + 3, 0);
    uint32_t num_bytes = 0;
    std::string piece;
    for (size_t offset = 0; offset < text.size();) {
      const size_t taken = std::min<size_t>(1 + random() % 40, text.size() - offset);
      piece += text.substr(offset, taken);
      offset += taken;
      auto len = static_cast<uint32_t>(piece.size());
      num_bytes += base64urlDecodePiece(piece.data(), &len, offset == text.size(),
                                        reinterpret_cast<uint8_t *>(bytes.data()) + num_bytes);
      ASSERT_LE(len, 3u);
      piece.resize(len);
    }
    EXPECT_EQ(bytes.substr(0, num_bytes), str(whole)) << text;
  }
}

}  // namespace
}  // namespace otrp_test
