// SPDX-License-Identifier: BSD-2-Clause
// Verification of a request and signing of a response of 1.5 KiB against two JOSE libraries. The
// bound is one pass of the tokenizer and the same in OpenSSL's EVP interface, which the host TEE
// works with.
#include <memory>
#include <stdexcept>

#include "crypto/rsa.h"
#include "floor.h"
#include "inside.h"
#include "rivals.h"
#include "security/jws.h"
#include "state/object_store.h"
#include "suite.h"
#include "support/scene.h"
#include "tsm/protocol/request.h"

namespace bench {
namespace {

constexpr size_t kMessageLen = 1536;
constexpr char kName[] = "DeleteTARequest";
constexpr char kStoredKeyId[] = "TSM_INFO_tsm1";

void require(bool passed, const char *what) {
  if (!passed) throw std::runtime_error(what);
}

key_object make_key(const RsaNumbers &numbers) {
  key_object key;
  TEE_Attribute attributes[3];
  const auto put = [&](size_t i, uint32_t id, const std::string &number) {
    TEE_InitRefAttribute(&attributes[i], id, number.data(), static_cast<uint32_t>(number.size()));
  };
  put(0, TEE_ATTR_RSA_MODULUS, numbers.n);
  put(1, TEE_ATTR_RSA_PUBLIC_EXPONENT, numbers.e);
  put(2, TEE_ATTR_RSA_PRIVATE_EXPONENT, numbers.d);
  TEE_Result result = TEE_AllocateTransientObject(TEE_TYPE_RSA_KEYPAIR, kRsaKeyBits, out(key));
  if (result == TEE_SUCCESS) result = TEE_PopulateTransientObject(key.get(), attributes, 3);
  if (result != TEE_SUCCESS) throw std::runtime_error("a key was refused");
  return key;
}

// The payload's length makes the message 1.5 KiB long.
struct Message {
  std::string payload;
  std::string text;
  std::string compact;
};

Message make_message(const tsm::RsaKey &key) {
  Message message;
  for (size_t len = 600; message.text.size() < kMessageLen; ++len) {
    message.payload = R"({"filler":")" + std::string(len, 'x') + R"("})";
    message.text = tsm::seal_text(message.payload, kName, "tsm1", key, tsm::Json::object());
  }
  const tsm::Json envelope = tsm::parse_json(message.text).value().at(kName);
  for (const char *name : {"protect", "payload", "signature"}) {
    if (!message.compact.empty()) message.compact += '.';
    message.compact += envelope.at(name).get<std::string>();
  }
  return message;
}

struct Stage {
  Stage() {
    const std::string stored = tsm::base64url_encode(tsm_key.encoded());
    require(
        save_data_to_persistent_object(stored.data(), static_cast<uint32_t>(stored.size()),
                                       kStoredKeyId, sizeof kStoredKeyId - 1, true) == TEE_SUCCESS,
        "a key was not stored");
  }

  Inside inside;
  const tsm::RsaKey &tsm_key = otrp_test::key_named("tsm");
  const RsaNumbers numbers = numbers_of(tsm_key, false);
  const Message message = make_message(tsm_key);
  const key_object key = make_key(numbers);
};

// As the pipeline does it, the key's record included.
void verify_with_stored_key(const Stage &stage) {
  const Message &message = stage.message;
  request_context context = {bytes_of(message.text), static_cast<uint32_t>(message.text.size()),
                             kName};
  const TEE_Result result = verify_decode_by_name(&context);
  const tee_ptr<uint8_t> payload(context.payload);
  const token_object_ptr tokens(context.tokens);
  require(result == TEE_SUCCESS && context.payload_len == message.payload.size(),
          "the agent did not verify a message");
}

void verify(const Stage &stage) {
  const Message &message = stage.message;
  const jsmn_string text = {message.text.data(), static_cast<uint32_t>(message.text.size())};
  const token_object_ptr root(jsmn_init_object(&text));
  const token_object_ptr envelope(jsmn_object_get_object(root.get(), kName));
  const slice_ptr payload(jsmn_object_get_string(envelope.get(), "payload"));
  const slice_ptr protect(jsmn_object_get_string(envelope.get(), "protect"));
  const slice_ptr signature(jsmn_object_get_string(envelope.get(), "signature"));
  secret_bytes decoded;
  require(
      verify_signature(stage.key.get(), payload.get(), protect.get(), signature.get(), &decoded) &&
          decoded.len == message.payload.size(),
      "the agent did not verify a message");
}

void sign(const Stage &stage, TEE_ObjectHandle key) {
  const json_text text(construct_json_signature("DeleteTAResponse", stage.message.payload.c_str(),
                                                JWS_HEADER_RS256, nullptr, key));
  require(bool(text), "the agent did not sign a message");
}

void sign_with_stored_key(const Stage &stage) {
  sign(stage, make_key(stage.numbers).get());
}

void sign_with_key_at_hand(const Stage &stage) {
  sign(stage, stage.key.get());
}

struct Case {
  const char *name;
  void (*ours)(const Stage &);
  void (*theirs)(const Rival &, const Message &);
  double JoseLibrary::*target;
  Work (*bound)(size_t payload_len, Keys keys);
  Keys keys;
};

// Libraries sign with a key that is ready, made of the same three numbers as the device's.
const Case kCases[] = {
    {"verify, stored key", verify_with_stored_key,
     [](const Rival &rival, const Message &message) {
       rival.verify_with_stored_key(message.compact, message.payload.size());
     },
     &JoseLibrary::verify_target, verification_of, Keys::kNew},
    {"verify, key at hand", verify,
     [](const Rival &rival, const Message &message) {
       rival.verify(message.compact, message.payload.size());
     },
     &JoseLibrary::verify_target, verification_of, Keys::kAtHand},
    {"sign, stored key", sign_with_stored_key,
     [](const Rival &rival, const Message &message) { rival.sign(message.payload); },
     &JoseLibrary::sign_target, signing_of, Keys::kNew},
    {"sign, key at hand", sign_with_key_at_hand,
     [](const Rival &rival, const Message &message) { rival.sign(message.payload); },
     &JoseLibrary::sign_target, signing_of, Keys::kAtHand},
};

Comparison compare(const Case &c) {
  const auto stage = std::make_shared<const Stage>();
  Comparison comparison = {{{"agent", [&c, stage] { c.ours(*stage); }}}};
  for (const JoseLibrary &library : known<JoseLibrary>()) {
    const auto rival = std::make_shared<Rival>(library, stage->numbers);
    comparison.contestants.push_back(
        {.name = library.name,
         .run = [&c, stage, rival] { c.theirs(*rival, stage->message); },
         .target = library.*c.target});
  }
  const size_t payload_len = tsm::base64url_encode(stage->message.payload).size();
  comparison.contestants.push_back(
      {kBound, [work = c.bound(payload_len, c.keys), read = reading_of(stage->message.text)] {
         read();
         work();
       }});
  return comparison;
}

}  // namespace

void add_signatures(Suite &suite) {
  for (const Case &c : kCases) {
    suite.compare(std::string("signatures/") + c.name, [&c] { return compare(c); });
  }
}

}  // namespace bench
