// SPDX-License-Identifier: BSD-2-Clause
// The record box: it takes what a reader of a few lines takes, and gives it back as it was.
#include <map>
#include <optional>
#include <vector>

#include "crypto/tlv_box.h"
#include "support/inside.h"

namespace {

struct Record {
  uint16_t type;
  std::string_view value;
};

uint16_t half_word(std::string_view bytes, size_t at) {
  return static_cast<uint16_t>(static_cast<uint8_t>(bytes[at]) | static_cast<uint8_t>(bytes[at + 1])
                                                                     << 8);
}

std::optional<std::vector<Record>> read_records(std::string_view left) {
  std::map<uint16_t, std::string_view> seen;
  std::vector<Record> records;
  while (!left.empty()) {
    if (left.size() < 4) return std::nullopt;
    const Record record = {half_word(left, 0), left.substr(4, half_word(left, 2))};
    if (record.value.size() != half_word(left, 2)) return std::nullopt;
    if (!seen.emplace(record.type, record.value).second) return std::nullopt;
    records.push_back(record);
    left.remove_prefix(4 + record.value.size());
  }
  return records;
}

void require_record(const tlv_box *box, const Record &record) {
  const uint8_t *bytes = nullptr;
  uint32_t len = 0;
  fuzz::require(tlv_box_get_bytes_ptr(box, record.type, &bytes, &len) == 0, "a record is there");
  fuzz::require(fuzz::as_view(bytes, len) == record.value, "a record has its value");

  std::string copy(record.value.size() + 1, 'x');
  uint32_t capacity = static_cast<uint32_t>(copy.size());
  const int copied =
      tlv_box_get_bytes(box, record.type, reinterpret_cast<uint8_t *>(copy.data()), &capacity);
  fuzz::require(copied == 0 && copy == std::string(record.value) + '\0',
                "a copy has the value and zeros behind it");

  uint32_t number = 0;
  const bool is_int = tlv_box_get_int(box, record.type, &number) == 0;
  fuzz::require(is_int == (record.value.size() >= 4), "four bytes make an int");
}

// The record that is put last comes first.
void require_rebuilt(const std::vector<Record> &records, std::string_view input) {
  const box_ptr box(tlv_box_create());
  for (auto record = records.rbegin(); record != records.rend(); ++record) {
    const int put = tlv_box_put_bytes(box.get(), record->type,
                                      reinterpret_cast<const uint8_t *>(record->value.data()),
                                      static_cast<uint32_t>(record->value.size()));
    fuzz::require(put == 0, "an open box takes a record");
  }
  fuzz::require(tlv_box_get_size(box.get()) == input.size(), "the size is known before");
  fuzz::require(tlv_box_serialize(box.get()) == 0, "a box is serialized");
  fuzz::require(fuzz::as_view(tlv_box_get_buffer(box.get()), tlv_box_get_size(box.get())) == input,
                "the same records make the same bytes");
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  fuzz::Inside &inside = fuzz::Inside::instance();
  const std::string_view input = fuzz::as_view(data, size);
  const auto records = read_records(input);
  {
    const box_ptr box(tlv_box_parse(data, static_cast<uint32_t>(size)));
    fuzz::require((box != nullptr) == records.has_value(), "whole records make a box");
    for (size_t i = 0; records && i < records->size(); ++i) {
      require_record(box.get(), (*records)[i]);
    }
  }
  if (records) require_rebuilt(*records, input);
  inside.require_clean();
  return 0;
}
