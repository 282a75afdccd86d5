// SPDX-License-Identifier: BSD-2-Clause
// The record box: it takes what a reader of a few lines takes, and gives it back as it was.
#include <optional>
#include <set>
#include <vector>

#include "crypto/tlv_box.h"
#include "support/inside.h"

namespace fuzz {

struct Record {
  uint16_t type;
  std::string_view value;
};

static uint16_t half_word(std::string_view bytes, size_t at) {
  return static_cast<uint16_t>(u8(bytes)[at] | u8(bytes)[at + 1] << 8);
}

static std::optional<std::vector<Record>> read_records(std::string_view left) {
  std::set<uint16_t> seen;
  std::vector<Record> records;
  while (!left.empty()) {
    if (left.size() < 4) return std::nullopt;
    const Record record = {half_word(left, 0), left.substr(4, half_word(left, 2))};
    if (record.value.size() != half_word(left, 2)) return std::nullopt;
    if (!seen.insert(record.type).second) return std::nullopt;
    records.push_back(record);
    left.remove_prefix(4 + record.value.size());
  }
  return records;
}

static void require_record(const tlv_box *box, const Record &record) {
  const uint8_t *bytes = nullptr;
  uint32_t len = 0;
  require(tlv_box_get_bytes_ptr(box, record.type, &bytes, &len) == 0, "a record is there");
  require(as_view(bytes, len) == record.value, "a record has its value");
}

// The record that is put last comes first.
static void require_rebuilt(const std::vector<Record> &records, std::string_view input) {
  const box_ptr box(tlv_box_create());
  for (auto record = records.rbegin(); record != records.rend(); ++record) {
    const auto len = static_cast<uint32_t>(record->value.size());
    require(tlv_box_put_bytes(box.get(), record->type, u8(record->value), len) == 0,
            "an open box takes a record");
  }
  require(tlv_box_get_size(box.get()) == input.size(), "the size is known before");
  require(tlv_box_serialize(box.get()) == 0, "a box is serialized");
  require(as_view(tlv_box_get_buffer(box.get()), tlv_box_get_size(box.get())) == input,
          "the same records make the same bytes");
}

void check(std::string_view input) {
  const Inside inside;
  const device::Buffer exact(input);
  const auto records = read_records(input);
  const box_ptr box(tlv_box_parse(u8(exact.bytes()), static_cast<uint32_t>(input.size())));
  require(bool(box) == records.has_value(), "whole records make a box");
  if (!records) return;
  for (const Record &record : *records) require_record(box.get(), record);
  require_rebuilt(*records, input);
}

}  // namespace fuzz
