// SPDX-License-Identifier: BSD-2-Clause
#include "support/record_list.h"

#include "common/encoding.h"

namespace fuzz {

std::vector<StoredRecord> parse_records(std::string_view bytes) {
  std::vector<StoredRecord> records;
  for (;;) {
    const size_t id_len = bytes.empty() ? 0 : static_cast<uint8_t>(bytes[0]);
    if (bytes.size() < 1 + id_len + 2) return records;
    const std::string_view id = bytes.substr(1, id_len);
    bytes.remove_prefix(1 + id_len);
    const size_t data_len =
        static_cast<uint8_t>(bytes[0]) | static_cast<size_t>(static_cast<uint8_t>(bytes[1])) << 8;
    if (bytes.size() < 2 + data_len) return records;
    records.push_back({std::string(id), std::string(bytes.substr(2, data_len))});
    bytes.remove_prefix(2 + data_len);
  }
}

std::string serialize_records(const std::vector<StoredRecord> &records) {
  std::string bytes;
  for (const StoredRecord &record : records) {
    bytes += tools::little_endian(record.id.size(), 1) + record.id +
             tools::little_endian(record.data.size(), 2) + record.data;
  }
  return bytes;
}

}  // namespace fuzz
