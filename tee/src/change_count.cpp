// SPDX-License-Identifier: BSD-2-Clause
#include "change_count.h"

#include <unistd.h>

#include <array>
#include <bit>

namespace tee {

static_assert(std::endian::native == std::endian::little);

uint64_t ChangeCount::read() const {
  const host::File file = host::open_for_reading(path_.c_str());
  std::array<uint64_t, 2> record;
  const bool whole = file.valid() && ::pread(file.get(), record.data(), sizeof(record), 0) ==
                                         static_cast<ssize_t>(sizeof(record));
  return whole && record[1] == ~record[0] ? record[0] : 0;
}

void ChangeCount::write(uint64_t count) {
  if (!file_.valid()) file_ = host::open_or_create(path_.c_str());
  const std::array<uint64_t, 2> record = {count, ~count};
  [[maybe_unused]] const ssize_t ignored = ::pwrite(file_.get(), record.data(), sizeof(record), 0);
}

void ChangeCount::remove() {
  ::unlink(path_.c_str());
}

}  // namespace tee
