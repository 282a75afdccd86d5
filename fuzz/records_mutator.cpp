// SPDX-License-Identifier: BSD-2-Clause
// Records change as documents, and the key boxes in them as bytes; the length in front stays right
// more often than not.
#include "support/mutation.h"
#include "support/stored_device.h"

namespace fuzz {

constexpr size_t kLengthLen = 4;

static std::string mutate_payload(const std::string &text, Random &random) {
  std::optional<tsm::Json> record = tsm::parse_json(text);
  const std::string *aik = record ? tsm::find_string(*record, "aik") : nullptr;
  const auto box = aik == nullptr ? std::nullopt : tsm::base64_decode(*aik);
  if (!box || random.one_in(3)) return mutate_json(text, text.size() + 128, random);
  (*record)["aik"] = tsm::base64_encode(mutate_bytes(*box, box->size() + 16));
  return tsm::serialize_as_device(*record);
}

static std::string mutate_data(const std::string &data, Random &random) {
  if (data.size() < kLengthLen || random.one_in(8)) return mutate_bytes(data, data.size() + 16);
  const std::string payload = mutate_payload(data.substr(kLengthLen), random);
  const bool keeps_length = random.one_in(8);
  return (keeps_length ? data.substr(0, kLengthLen)
                       : tsm::little_endian(payload.size(), kLengthLen)) +
         payload;
}

std::string mutate(std::string_view input, size_t, Random &random) {
  Objects objects = parse_objects(input);
  const bool takes_another = objects.empty() || random.one_in(16);
  const Objects &all = takes_another ? stored_device().agent : objects;
  auto [id, data] = std::pair<std::string, std::string>(
      *std::next(all.begin(), static_cast<ptrdiff_t>(random.below(all.size()))));
  objects.erase(id);
  if (random.one_in(16)) {
    id = mutate_bytes(id, 64);
  } else {
    data = mutate_data(data, random);
  }
  objects[id] = data;
  return serialize_objects(objects);
}

}  // namespace fuzz
