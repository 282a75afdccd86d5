// SPDX-License-Identifier: BSD-2-Clause
/// Stored objects as one input:
///
///     ID length (1) | ID | data length (2, little-endian) | data | more objects
#ifndef FUZZ_RECORD_LIST_H
#define FUZZ_RECORD_LIST_H

#include <string>
#include <string_view>
#include <vector>

namespace fuzz {

struct StoredRecord {
  std::string id;
  std::string data;
};

/// Up to the first one that is cut short.
std::vector<StoredRecord> parse_records(std::string_view bytes);
std::string serialize_records(const std::vector<StoredRecord> &records);

}  // namespace fuzz

#endif
