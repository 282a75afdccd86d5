// SPDX-License-Identifier: BSD-2-Clause
#include "state/json_node.h"

// ---- Where the characters go

namespace {

// One walk counts the characters, `text` being NULL, and the next one writes them.
struct text_sink {
  char *text;
  uint64_t len;

  void put(char c) {
    if (text != nullptr) text[len] = c;
    ++len;
  }
  void put_run(const char *run, uint32_t run_len) {
    if (text != nullptr) memcpy(text + len, run, run_len);
    len += run_len;
  }
};

}  // namespace

char escape_letter(char c) {
  switch (c) {
    case '"':
    case '\\':
    case '/':
      return c;
    case '\b':
      return 'b';
    case '\f':
      return 'f';
    case '\n':
      return 'n';
    case '\r':
      return 'r';
    case '\t':
      return 't';
    default:
      return 0;
  }
}

static void put_escaped(text_sink *out, const char *text, uint32_t len) {
  for (uint32_t i = 0; i < len;) {
    if (len - i >= 8 && not_plain(load_eight(text + i)) == 0) {
      out->put_run(text + i, 8);
      i += 8;
      continue;
    }
    for (const uint32_t end = len - i >= 8 ? i + 8 : len; i < end; ++i) {
      const char letter = escape_letter(text[i]);
      if (letter != 0) out->put('\\');
      out->put(letter != 0 ? letter : text[i]);
    }
  }
}

// ---- Numbers

// `digits` ends at `end`; returns where it starts.
static char *put_digits_before(char *end, uint64_t number, uint32_t min_digits) {
  for (; number != 0 || min_digits != 0; number /= 10) {
    *--end = static_cast<char>('0' + number % 10);
    if (min_digits != 0) --min_digits;
  }
  return end;
}

static void put_digits(text_sink *out, uint64_t number, uint32_t min_digits) {
  char digits[20];  // 2^64 has as many
  char *end = digits + sizeof digits;
  const char *start = put_digits_before(end, number, min_digits);
  out->put_run(start, static_cast<uint32_t>(end - start));
}

namespace {

// A finite value as mantissa x 2^exponent, without its sign.
struct binary_number {
  uint64_t mantissa;
  int exponent;
};

}  // namespace

static binary_number take_apart(double value) {
  uint64_t bits;
  static_assert(sizeof bits == sizeof value);
  memcpy(&bits, &value, sizeof bits);
  const int biased = static_cast<int>(bits >> 52) & 0x7FF;
  const uint64_t fraction = bits & ((uint64_t{1} << 52) - 1);
  if (biased == 0) return {fraction, -1074};
  return {fraction | (uint64_t{1} << 52), biased - 1075};
}

static constexpr uint32_t kMillion = 1000000;

// fraction / 2^shift in millionths, rounded to the nearest, a tie to the even one.
static uint32_t millionths(uint64_t fraction, int shift) {
  // The product has up to 73 bits: `high` counts units of 2^32. A shift of 33 at least keeps half
  // of the divisor in `high`.
  if (shift < 33) {
    fraction <<= 33 - shift;
    shift = 33;
  }
  if (shift >= 96) return 0;
  const uint64_t low_product = (fraction & UINT32_MAX) * kMillion;
  const uint64_t high = (fraction >> 32) * kMillion + (low_product >> 32);
  const bool low = (low_product & UINT32_MAX) != 0;
  const int high_shift = shift - 32;
  const uint64_t half = uint64_t{1} << (high_shift - 1);
  const uint64_t rest = high & ((half << 1) - 1);
  const auto quotient = static_cast<uint32_t>(high >> high_shift);
  const bool up = rest > half || (rest == half && (low || (quotient & 1) != 0));
  return quotient + (up ? 1 : 0);
}

static void put_fraction(text_sink *out, const binary_number &number) {
  const int shift = -number.exponent;
  uint64_t whole = shift < 64 ? number.mantissa >> shift : 0;
  const uint64_t fraction =
      shift < 64 ? number.mantissa & ((uint64_t{1} << shift) - 1) : number.mantissa;
  uint32_t parts = millionths(fraction, shift);
  if (parts == kMillion) {
    ++whole;
    parts = 0;
  }
  put_digits(out, whole, 1);
  out->put_run(".", 1);
  put_digits(out, parts, 6);
}

static constexpr uint32_t kBillion = 1000000000;
static constexpr uint32_t kMaxBillions = 35;  // limbs of 2^1024

// An integer of 2^63 or more, exactly, and six zeros: limbs of nine digits, doubled as often as it
// takes.
static void put_large(text_sink *out, const binary_number &number) {
  uint32_t limbs[kMaxBillions] = {};
  uint32_t num_limbs = 0;
  for (uint64_t rest = number.mantissa; rest != 0; rest /= kBillion) {
    limbs[num_limbs++] = static_cast<uint32_t>(rest % kBillion);
  }
  for (int left = number.exponent; left > 0; left -= 16) {
    const int step = left < 16 ? left : 16;
    uint64_t carry = 0;
    for (uint32_t i = 0; i < num_limbs; ++i) {
      carry += uint64_t{limbs[i]} << step;
      limbs[i] = static_cast<uint32_t>(carry % kBillion);
      carry /= kBillion;
    }
    if (carry != 0) limbs[num_limbs++] = static_cast<uint32_t>(carry);
  }
  put_digits(out, limbs[num_limbs - 1], 1);
  for (uint32_t i = num_limbs - 1; i-- > 0;) put_digits(out, limbs[i], 9);
  out->put_run(".000000", 7);
}

static void put_decimal(text_sink *out, double value) {
  constexpr double kInt64Limit = 9223372036854775808.0;
  const bool in_range = value >= -kInt64Limit && value < kInt64Limit;
  const bool integral = !in_range || static_cast<double>(static_cast<int64_t>(value)) == value;
  if (value < 0) out->put_run("-", 1);
  if (!integral) {
    put_fraction(out, take_apart(value));
  } else if (in_range) {
    const auto whole = static_cast<int64_t>(value);
    put_digits(out, whole < 0 ? 0 - static_cast<uint64_t>(whole) : static_cast<uint64_t>(whole), 1);
  } else {
    put_large(out, take_apart(value));
  }
}

// ---- Documents

static void put_string(text_sink *out, const char *text, uint32_t len, bool plain) {
  out->put('"');
  if (plain) {
    out->put_run(text, len);
  } else {
    put_escaped(out, text, len);
  }
  out->put('"');
}

// A whole value, of a container the opening bracket.
static void put_value(text_sink *out, const JSON_Value *value) {
  switch (value->type) {
    case kJsonNull:
      return out->put_run("null", 4);
    case kJsonFalse:
      return out->put_run("false", 5);
    case kJsonTrue:
      return out->put_run("true", 4);
    case kJsonNumber:
      return put_decimal(out, value->number);
    case kJsonString:
      return put_string(out, value->text, value->count, (value->flags & kPlainText) != 0);
    case kJsonVerbatim:
      return out->put_run(value->text, static_cast<uint32_t>(strlen(value->text)));
    case kJsonSlice:
      return out->put_run(value->text, value->count);
    case kJsonArray:
      return out->put('[');
    case kJsonObject:
      return out->put('{');
  }
}

static void put_closing(text_sink *out, const JSON_Value *container) {
  out->put(container->type == kJsonArray ? ']' : '}');
}

namespace {

struct line_layout {
  bool pretty;
  uint32_t level = 0;

  void new_line(text_sink *out) const {
    if (!pretty) return;
    out->put('\n');
    for (uint32_t i = 0; i < level; ++i) out->put_run("    ", 4);
  }
};

}  // namespace

static void put_name(text_sink *out, const JSON_Value *member, const line_layout &layout) {
  if (member->name == nullptr) return;
  put_string(out, member->name, name_len(member), (member->flags & kPlainName) != 0);
  out->put(':');
  if (layout.pretty) out->put(' ');
}

static void put_document(text_sink *out, const JSON_Value *root, bool pretty) {
  line_layout layout = {pretty};
  put_value(out, root);
  for (const JSON_Value *at = root;;) {
    if (has_children(at)) {
      at = at->first;
      ++layout.level;
    } else {
      if (is_container(at)) put_closing(out, at);
      for (; at != root && is_last_child(at); put_closing(out, at)) {
        at = at->next;
        --layout.level;
        layout.new_line(out);
      }
      if (at == root) return;
      at = at->next;
      out->put(',');
    }
    layout.new_line(out);
    put_name(out, at, layout);
    put_value(out, at);
  }
}

static char *serialize(const JSON_Value *value, bool pretty, uint32_t *len) {
  *len = 0;
  if (value == nullptr) return nullptr;
  text_sink out = {};
  put_document(&out, value, pretty);
  if (out.len >= UINT32_MAX) return nullptr;
  auto *text = reinterpret_cast<char *>(allocate_bytes(static_cast<uint32_t>(out.len) + 1));
  if (text == nullptr) return nullptr;
  out = {text, 0};
  put_document(&out, value, pretty);
  text[out.len] = 0;
  *len = static_cast<uint32_t>(out.len);
  return text;
}

char *json_serialize_to_string(const JSON_Value *value) {
  uint32_t len;
  return serialize(value, false, &len);
}

bool json_serialize_to_bytes(const JSON_Value *value, secret_bytes *text) {
  text->data = reinterpret_cast<uint8_t *>(serialize(value, false, &text->len));
  return text->data != nullptr;
}

char *json_serialize_to_string_pretty(const JSON_Value *value) {
  uint32_t len;
  return serialize(value, true, &len);
}
