// SPDX-License-Identifier: BSD-2-Clause
#include "state/token_reader.h"

#define JSMN_STATIC
#include <jsmn.h>

#include "failure.h"
#include "platform.h"

// The tokenizer's record under a name that the header can declare.
struct jsmn_token : jsmntok_t {};
static_assert(sizeof(jsmn_token) == sizeof(jsmntok_t));

static constexpr int kUsualTokens = 64;
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
  if (text.len > INT32_MAX) return JSMN_ERROR_NOMEM;
  jsmn_parser parser;
  jsmn_init(&parser);
  return jsmn_parse(&parser, text.data, text.data != nullptr ? text.len : 0, tokens,
                    static_cast<unsigned>(num_tokens));
}

// Where a string begins that is a member's value: at a quote behind a colon. NULL: nowhere.
static const char *find_value_string(const char *at, const char *end) {
  while (at < end) {
    const auto *quote = static_cast<const char *>(memchr(at, '"', static_cast<size_t>(end - at)));
    if (quote == nullptr || quote[-1] == ':') return quote;
    at = quote + 1;
  }
  return nullptr;
}

// The quote that ends the string. NULL when there is none, or something before it that the
// tokenizer would look at.
static const char *find_plain_end(const char *string, const char *end) {
  const auto *quote =
      static_cast<const char *>(memchr(string, '"', static_cast<size_t>(end - string)));
  if (quote == nullptr) return nullptr;
  const auto len = static_cast<size_t>(quote - string);
  const bool is_plain = memchr(string, '\\', len) == nullptr && memchr(string, 0, len) == nullptr;
  return is_plain ? quote : nullptr;
}

// Passes over the values that are plain strings: a text with an image is little else, and the
// tokenizer would look at each character. What is before one it reads as if the text ended there,
// which cuts nothing in two: a word ends at the colon, and of a string that is not over it goes
// back to the beginning. When it has not come up to the value, for that reason or any other, the
// rest of the text is left to it.
static void pass_over_values(jsmn_parser *parser, const jsmn_string &text, jsmn_token *tokens,
                             unsigned num_tokens) {
  const char *end = text.data + text.len;
  const char *begin = text.data + 1;
  while ((begin = find_value_string(begin, end)) != nullptr) {
    const auto at = static_cast<uint32_t>(begin - text.data);
    jsmn_parse(parser, text.data, at, tokens, num_tokens);
    const char *closing = find_plain_end(begin + 1, end);
    if (parser->pos != at || closing == nullptr) return;
    jsmntok_t *token = jsmn_alloc_token(parser, tokens, num_tokens);
    if (token == nullptr) return;
    parser->pos = static_cast<uint32_t>(closing - text.data);
    jsmn_fill_token(token, JSMN_STRING, static_cast<int>(at + 1), static_cast<int>(parser->pos));
    if (parser->toksuper != -1) ++tokens[parser->toksuper].size;
    ++parser->pos;
    begin = closing + 1;
  }
}

// The same as tokenize() for a text of few tokens, which may be large. An error may be another one.
static int tokenize_few(const jsmn_string &text, jsmn_token *tokens, int num_tokens) {
  if (text.data == nullptr || text.len == 0 || text.len > INT32_MAX) return JSMN_ERROR_NOMEM;
  jsmn_parser parser;
  jsmn_init(&parser);
  pass_over_values(&parser, text, tokens, static_cast<unsigned>(num_tokens));
  return jsmn_parse(&parser, text.data, text.len, tokens, static_cast<unsigned>(num_tokens));
}

static tee_ptr<jsmn_token> allocate_tokens(int num_tokens) {
  const uint64_t len = static_cast<uint64_t>(num_tokens) * sizeof(jsmn_token);
  if (len > UINT32_MAX) return {};
  return tee_ptr<jsmn_token>(
      reinterpret_cast<jsmn_token *>(allocate_bytes(static_cast<uint32_t>(len))));
}

static const char kInitObject[] = "jsmn_init_object";

static const char kNoMemory[] = "malloc jsmn_object error no memory";

static int count_and_tokenize(const jsmn_string &text, tee_ptr<jsmn_token> *tokens) {
  const int num_tokens = tokenize(text, nullptr, 0);
  CHECK_AS(kInitObject, num_tokens >= 1, -1, "compute jsmn_string tokens fail with code: %d\n",
           num_tokens);
  if (num_tokens > kManyTokens) trace_error(kInitObject, __LINE__, "json object too big");
  *tokens = allocate_tokens(num_tokens);
  CHECK_AS(kInitObject, *tokens, -1, "%s", kNoMemory);
  const int count = tokenize(text, tokens->get(), num_tokens);
  CHECK_AS(kInitObject, count >= 0, -1, "Failed to parse JSON: %d\n", count);
  return count;
}

// Most texts have few tokens, however large they are: they are read once, and counted first only
// when they have more, or to find out what is wrong with them. Negative when it fails.
static int tokenize_text(const jsmn_string &text, tee_ptr<jsmn_token> *tokens) {
  tee_ptr<jsmn_token> room = allocate_tokens(kUsualTokens);
  CHECK_AS(kInitObject, room, -1, "%s", kNoMemory);
  const int count = tokenize_few(text, room.get(), kUsualTokens);
  if (count < 1) {
    room.reset();
    return count_and_tokenize(text, tokens);
  }
  *tokens = allocate_tokens(count);
  CHECK_AS(kInitObject, *tokens, -1, "%s", kNoMemory);
  memcpy(tokens->get(), room.get(), static_cast<size_t>(count) * sizeof(jsmn_token));
  return count;
}

static jsmn_object *make_object(const jsmn_string &text, tee_ptr<jsmn_token> *tokens,
                                uint32_t count) {
  token_object_ptr object(reinterpret_cast<jsmn_object *>(allocate_bytes(sizeof(jsmn_object))));
  CHECK_AS(kInitObject, object, nullptr, "%s", kNoMemory);
  object->text = jsmn_init_string();
  if (object->text == nullptr) return nullptr;
  *object->text = text;
  object->tokens = tokens->release();
  object->count = count;
  return object.release();
}

jsmn_object *jsmn_init_object(const jsmn_string *slice) {
  const jsmn_string text = slice != nullptr ? *slice : jsmn_string{};
  tee_ptr<jsmn_token> tokens;
  const int count = tokenize_text(text, &tokens);
  if (count < 0) return nullptr;
  CHECK(count >= 1 && tokens.get()->type == JSMN_OBJECT, nullptr, "Object expected\n");
  return make_object(text, &tokens, static_cast<uint32_t>(count));
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

// The token behind the key, or NULL.
static const jsmn_token *find_value(const jsmn_object *object, const char *key) {
  if (object == nullptr || key == nullptr) return nullptr;
  const jsmn_token *tokens = object->tokens;
  const size_t key_len = strlen(key);
  uint32_t i = 1;
  while (i < object->count && !is_key(tokens[i], *object->text, key, key_len)) ++i;
  return i + 1 < object->count ? &tokens[i + 1] : nullptr;
}

static jsmn_string text_of(const jsmn_object *object, const jsmn_token *token) {
  if (token == nullptr) return {};
  return {object->text->data + token->start, static_cast<uint32_t>(token->end - token->start)};
}

jsmn_string *jsmn_object_get_string(const jsmn_object *object, const char *key) {
  jsmn_string *slice = jsmn_init_string();
  if (slice != nullptr) *slice = text_of(object, find_value(object, key));
  return slice;
}

// An object over the part of a text that begins at `offset`, from the part's tokens. The text,
// which may be large, is not read again.
static jsmn_object *copy_tokens(const jsmn_string &part, int offset, const jsmn_token *from,
                                uint32_t count) {
  if (count > kManyTokens) trace_error(kInitObject, __LINE__, "json object too big");
  tee_ptr<jsmn_token> tokens = allocate_tokens(static_cast<int>(count));
  CHECK_AS(kInitObject, tokens, nullptr, "%s", kNoMemory);
  for (uint32_t i = 0; i < count; ++i) {
    tokens.get()[i] = from[i];
    tokens.get()[i].start -= offset;
    tokens.get()[i].end -= offset;
  }
  return make_object(part, &tokens, count);
}

jsmn_object *jsmn_copy_object(const jsmn_object *object) {
  return copy_tokens(*object->text, 0, object->tokens, object->count);
}

// The tokens of an inner object follow its own.
static jsmn_object *copy_inner_object(const jsmn_object *object, const jsmn_token *inner) {
  const jsmn_token *end = inner;
  const jsmn_token *last = object->tokens + object->count;
  while (end != last && end->start < inner->end) ++end;
  return copy_tokens(text_of(object, inner), inner->start, inner,
                     static_cast<uint32_t>(end - inner));
}

jsmn_object *jsmn_object_get_object(const jsmn_object *object, const char *key) {
  const jsmn_token *token = find_value(object, key);
  if (token != nullptr && token->type == JSMN_OBJECT) return copy_inner_object(object, token);
  const jsmn_string value = text_of(object, token);
  return jsmn_init_object(&value);
}
