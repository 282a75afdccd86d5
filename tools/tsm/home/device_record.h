// SPDX-License-Identifier: BSD-2-Clause
/// What the home keeps of one device, in a folder of its own:
///
///     device.json     the device file
///     dsi.json        the last verified state document, as the device made it
///     requests.json   {"last", "kept", "waiting"}: the number of the last request that was made,
///                     of the one whose answer brought the kept state, and what waits for an answer
///     plan.json       what is known on the way to a plan: see plan/progress.h
///     lock            held while a DeviceRecord lives
///
/// Files are replaced as a whole. Functions throw tools::UsageError; one that finds a file damaged
/// names it, and what mends it.
#ifndef TSM_HOME_DEVICE_RECORD_H
#define TSM_HOME_DEVICE_RECORD_H

#include <optional>
#include <string>

#include "common/files.h"
#include "tsm/protocol/parties.h"
#include "tsm/protocol/waiting.h"

namespace tsm {

/// How an answer is to be tied to what was asked.
struct TiePolicy {
  std::optional<SentRequest> named = {};  // in place of those that wait
  bool accept_old = false;
};

/// The kept state of the device in `folder`, or nothing.
std::optional<std::string> read_dsi_text(const std::string &folder);
std::optional<Json> read_dsi(const std::string &folder);

/// One exchange at a time: whoever talks to the device keeps its record to himself until the answer
/// is kept, so that two of them see the device's states one after the other.
class DeviceRecord {
 public:
  /// Makes the folder, and waits for others that hold it.
  DeviceRecord(std::string folder, DeviceInfo device);

  const DeviceInfo &device() const { return device_; }
  const std::string &folder() const { return folder_; }
  std::optional<Json> dsi() const { return read_dsi(folder_); }

  /// Writes the device file: the device is known from then on.
  void keep_device() const;

  /// Keeps what is about to be sent, until it is answered.
  void add(SentRequest request);

  /// The device will not answer it.
  void forget(const SentRequest &request);

  /// Ties a verified response to its request and keeps the state that it brings. Throws NotVerified
  /// for one that was not asked for, or that brings an older state than the kept one.
  Tie take(const Response &response, const TiePolicy &policy = {});

 private:
  struct Requests;
  struct Answered;
  std::string path(const char *name) const { return folder_ + "/" + name; }
  Requests load() const;
  void save(const Requests &requests) const;
  Answered find(const Response &response, const Requests &requests,
                const std::optional<SentRequest> &named) const;
  bool is_older(const Response &response, const SentRequest &request, uint64_t kept) const;

  std::string folder_;
  DeviceInfo device_;
  tools::FileLock lock_;
};

}  // namespace tsm

#endif
