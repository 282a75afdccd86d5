// SPDX-License-Identifier: BSD-2-Clause
// Records change as documents, and the key boxes in them as bytes; the length in front stays right
// more often than not.
#include "support/mutation.h"
#include "support/record_list.h"
#include "support/require.h"
#include "support/stored_device.h"

using namespace fuzz;

namespace {

constexpr size_t kLengthLen = 4;

std::string mutate_aik(const std::string &text, Random &random) {
  std::optional<tsm::Json> record = tsm::parse_json(text);
  const std::string *aik = record ? tsm::find_string(*record, "aik") : nullptr;
  const auto box = aik == nullptr ? std::nullopt : tsm::base64_decode(*aik);
  if (!box || random.one_in(3)) return mutate_json(text, text.size() + 128, random);
  (*record)["aik"] = tsm::base64_encode(mutate_bytes(*box, box->size() + 16));
  return tsm::serialize_as_device(*record);
}

void mutate_data(std::string *data, Random &random) {
  if (data->size() < kLengthLen || random.one_in(8)) {
    *data = mutate_bytes(*data, data->size() + 16);
    return;
  }
  std::string prefix = data->substr(0, kLengthLen);
  const std::string payload = mutate_aik(data->substr(kLengthLen), random);
  if (!random.one_in(8)) prefix = tsm::little_endian(payload.size(), kLengthLen);
  *data = prefix + payload;
}

}  // namespace

extern "C" size_t LLVMFuzzerCustomMutator(uint8_t *data, size_t size, size_t max_size,
                                          unsigned seed) {
  Random random(seed);
  std::vector<StoredRecord> records = parse_records(as_view(data, size));
  if (random.one_in(16)) return give(mutate_bytes(as_view(data, size), max_size), data, max_size);
  if (records.empty() || random.one_in(16)) {
    const Objects &agent = stored_device().agent;
    auto object = agent.begin();
    std::advance(object, random.below(agent.size()));
    records.push_back({object->first, object->second});
  }
  StoredRecord &record = records[random.below(records.size())];
  if (random.one_in(16)) {
    record.id = mutate_bytes(record.id, 64);
  } else {
    mutate_data(&record.data, random);
  }
  return give(serialize_records(records), data, max_size);
}
