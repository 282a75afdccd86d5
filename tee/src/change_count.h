// SPDX-License-Identifier: BSD-2-Clause
/// How many changes a database has acknowledged, in a file beside its log.
///
/// SQLite reads its log up to the first frame whose checksum fails, and takes what follows for a
/// change that a power cut has torn. A byte that changes in an older frame would thus undo what was
/// acknowledged, without a word. So the database counts its changes, each in its own transaction,
/// and here stands the count that was acknowledged last: a database that is behind it has lost
/// something.
///
/// The file is written when a change is durable, and never synced. It costs no time, and it cannot
/// be ahead of the database, so that a power cut raises no false alarm; it may then be behind by
/// what the system had not yet written. A killed process leaves it exact. When it cannot be written
/// or read, it says nothing.
///
///   count (8 bytes, little-endian) | its complement
#ifndef TEE_CHANGE_COUNT_H
#define TEE_CHANGE_COUNT_H

#include <cstdint>
#include <string>

#include "host_file.h"

namespace tee {

class ChangeCount {
 public:
  explicit ChangeCount(std::string path) : path_(std::move(path)) {}

  /// What the file says; 0 when there is none.
  uint64_t read() const;

  void write(uint64_t count);

  /// To be called when the log has gone into the database.
  void remove();

 private:
  const std::string path_;
  host::File file_;  // from the first write on
};

}  // namespace tee

#endif
