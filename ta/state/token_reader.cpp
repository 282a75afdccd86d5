#include "state/token_reader.h"

#include <limits.h>

#define JSMN_STATIC
#include <jsmn.h>

#include "failure.h"

// The tokenizer's record under a name that the header can declare.
struct jsmn_token : jsmntok_t {};
static_assert(sizeof(jsmn_token) == sizeof(jsmntok_t));

static constexpr int kManyTokens = 256;  // more are read, but not without a word

// ---- Slices

jsmn_string *jsmn_init_string() {
  auto *slice = reinterpret_cast<jsmn_string *>(allocate_bytes(sizeof(jsmn_string)));
  CHECK(slice != nullptr, nullptr, "malloc jsmn_string error no memory");
  return slice;
}

void jsmn_free_string(jsmn_string *slice) {
  TEE_Free(slice);
}

char *jsmn_string_dup(const char *data, uint32_t len) {
  if (data == nullptr || len == UINT32_MAX) return nullptr;
  auto *copy = reinterpret_cast<char *>(allocate_bytes(len + 1));
  if (copy != nullptr) memcpy(copy, data, len);
  return copy;
}

// ---- Objects

// The number of tokens, or an error of the tokenizer. Without an array it only counts. Positions
// are ints: it has no room for a longer text.
static int tokenize(const jsmn_string &text, jsmn_token *tokens, int num_tokens) {
  if (text.len > INT_MAX) return JSMN_ERROR_NOMEM;
  jsmn_parser parser;
  jsmn_init(&parser);
  return jsmn_parse(&parser, text.data, text.data != nullptr ? text.len : 0, tokens,
                    static_cast<unsigned>(num_tokens));
}

jsmn_object *jsmn_init_object(const jsmn_string *slice) {
  const jsmn_string text = slice != nullptr ? *slice : jsmn_string{};
  const int num_tokens = tokenize(text, nullptr, 0);
  CHECK(num_tokens >= 1, nullptr, "compute jsmn_string tokens fail with code: %d\n", num_tokens);
  if (num_tokens > kManyTokens) trace_error(__func__, __LINE__, "json object too big");

  const uint64_t tokens_len = static_cast<uint64_t>(num_tokens) * sizeof(jsmn_token);
  tee_ptr<jsmn_token> tokens;
  if (tokens_len <= UINT32_MAX) {
    tokens.reset(reinterpret_cast<jsmn_token *>(allocate_bytes(static_cast<uint32_t>(tokens_len))));
  }
  CHECK(tokens, nullptr, "malloc jsmn_object error no memory");
  const int count = tokenize(text, tokens.get(), num_tokens);
  CHECK(count >= 0, nullptr, "Failed to parse JSON: %d\n", count);
  CHECK(count >= 1 && tokens.get()->type == JSMN_OBJECT, nullptr, "Object expected\n");

  token_object_ptr object(reinterpret_cast<jsmn_object *>(allocate_bytes(sizeof(jsmn_object))));
  CHECK(object, nullptr, "malloc jsmn_object error no memory");
  object->text = jsmn_init_string();
  if (object->text == nullptr) return nullptr;
  *object->text = text;
  object->tokens = tokens.release();
  object->count = static_cast<uint32_t>(count);
  return object.release();
}

void jsmn_free_object(jsmn_object *object) {
  if (object == nullptr) return;
  jsmn_free_string(object->text);
  TEE_Free(object->tokens);
  TEE_Free(object);
}

// ---- Lookup

static bool is_key(const jsmn_token &token, const jsmn_string &text, const char *key,
                   size_t key_len) {
  return token.type == JSMN_STRING && static_cast<size_t>(token.end - token.start) == key_len &&
         memcmp(text.data + token.start, key, key_len) == 0;
}

static jsmn_string jsmn_find_value(const jsmn_string &text, const jsmn_token *tokens,
                                   uint32_t count, const char *key) {
  const size_t key_len = strlen(key);
  uint32_t i = 1;
  while (i < count && !is_key(tokens[i], text, key, key_len)) ++i;
  if (i + 1 >= count) return {};
  const jsmn_token &value = tokens[i + 1];
  return {text.data + value.start, static_cast<uint32_t>(value.end - value.start)};
}

static jsmn_string value_after(const jsmn_object *object, const char *key) {
  if (object == nullptr || key == nullptr) return {};
  return jsmn_find_value(*object->text, object->tokens, object->count, key);
}

jsmn_string *jsmn_object_get_string(const jsmn_object *object, const char *key) {
  jsmn_string *slice = jsmn_init_string();
  if (slice != nullptr) *slice = value_after(object, key);
  return slice;
}

jsmn_object *jsmn_object_get_object(const jsmn_object *object, const char *key) {
  const jsmn_string value = value_after(object, key);
  return jsmn_init_object(&value);
}
