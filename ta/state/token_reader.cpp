// SPDX-License-Identifier: BSD-2-Clause
#include "state/token_reader.h"

#define JSMN_STATIC
#include <jsmn.h>

#include "failure.h"
#include "platform.h"

// The tokenizer's record under a name that the header can declare.
struct jsmn_token : jsmntok_t {};
static_assert(sizeof(jsmn_token) == sizeof(jsmntok_t));

static constexpr uint32_t kUsualTokens = 64;
static constexpr uint32_t kManyTokens = 256;  // more are read, but not without a word

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
static int tokenize_few(const jsmn_string &text, jsmn_token *tokens, uint32_t num_tokens) {
  if (text.data == nullptr || text.len == 0 || text.len > INT32_MAX) return JSMN_ERROR_NOMEM;
  jsmn_parser parser;
  jsmn_init(&parser);
  pass_over_values(&parser, text, tokens, num_tokens);
  return jsmn_parse(&parser, text.data, text.len, tokens, num_tokens);
}

static const char kInitObject[] = "jsmn_init_object";

namespace {

// Its tokens follow it in the same block.
struct object_block {
  jsmn_object object;
  jsmn_string text;
};

}  // namespace

// An object with room for its tokens.
static jsmn_object *new_object(const jsmn_string &text, uint32_t num_tokens) {
  if (num_tokens > kManyTokens) trace_error(kInitObject, __LINE__, "json object too big");
  const uint64_t len = sizeof(object_block) + uint64_t{num_tokens} * sizeof(jsmn_token);
  auto *block = reinterpret_cast<object_block *>(
      len <= UINT32_MAX ? allocate_bytes(static_cast<uint32_t>(len)) : nullptr);
  CHECK_AS(kInitObject, block != nullptr, nullptr, "malloc jsmn_object error no memory");
  block->text = text;
  block->object = {reinterpret_cast<jsmn_token *>(block + 1), num_tokens, &block->text};
  return &block->object;
}

// An object over the part of a text that begins at `offset`, from the part's tokens. The text,
// which may be large, is not read again.
static jsmn_object *copy_tokens(const jsmn_string &part, int offset, const jsmn_token *from,
                                uint32_t count) {
  jsmn_object *copy = new_object(part, count);
  for (uint32_t i = 0; copy != nullptr && i < count; ++i) {
    copy->tokens[i] = from[i];
    copy->tokens[i].start -= offset;
    copy->tokens[i].end -= offset;
  }
  return copy;
}

static jsmn_object *count_and_tokenize(const jsmn_string &text) {
  const int num_tokens = tokenize(text, nullptr, 0);
  CHECK_AS(kInitObject, num_tokens >= 1, nullptr, "compute jsmn_string tokens fail with code: %d\n",
           num_tokens);
  token_object_ptr object(new_object(text, static_cast<uint32_t>(num_tokens)));
  if (!object) return nullptr;
  const int count = tokenize(text, object->tokens, num_tokens);
  CHECK_AS(kInitObject, count >= 0, nullptr, "Failed to parse JSON: %d\n", count);
  object->count = static_cast<uint32_t>(count);
  return object.release();
}

// Most texts have few tokens, however large they are: they are read once, and counted first only
// when they have more, or to find out what is wrong with them.
static jsmn_object *tokenize_text(const jsmn_string &text) {
  token_object_ptr room(new_object(text, kUsualTokens));
  if (!room) return nullptr;
  const int count = tokenize_few(text, room->tokens, kUsualTokens);
  if (count >= 1) return copy_tokens(text, 0, room->tokens, static_cast<uint32_t>(count));
  room.reset();
  return count_and_tokenize(text);
}

jsmn_object *jsmn_init_object(const jsmn_string *slice) {
  token_object_ptr object(tokenize_text(slice != nullptr ? *slice : jsmn_string{}));
  if (!object) return nullptr;
  CHECK(object->count >= 1 && object->tokens->type == JSMN_OBJECT, nullptr, "Object expected\n");
  return object.release();
}

void jsmn_free_object(jsmn_object *object) {
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
