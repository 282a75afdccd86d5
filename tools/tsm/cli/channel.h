// SPDX-License-Identifier: BSD-2-Clause
/// The way to a device: where requests go and answers come from.
#ifndef TSM_CLI_CHANNEL_H
#define TSM_CLI_CHANNEL_H

#include <cstdint>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>

#include "tsm/protocol/messages.h"
#include "tsm/protocol/parties.h"

namespace tsm {

/// The device did not answer, or only said that it failed. One line.
class ChannelError : public std::runtime_error {
 public:
  /// `code` is the result code that the device failed with; 0: it gave none.
  explicit ChannelError(const std::string &text, uint32_t code = 0)
      : std::runtime_error(text), code_(code) {}
  uint32_t code() const { return code_; }

 private:
  uint32_t code_;
};

/// Nothing came back: nobody is there, or what was sent or answered is lost.
class NoAnswer : public ChannelError {
 public:
  using ChannelError::ChannelError;
};

struct ChannelAnswer {
  std::string response;        // empty when the device only says that it failed
  std::optional<Bytes> image;  // that the device hands back
  std::string failure;         // what it failed with, also beside a response; or empty
  uint32_t code = 0;           // of that, if it has one
};

/// Functions throw ChannelError.
class Channel {
 public:
  virtual ~Channel() = default;

  /// As the device itself says, which proves nothing.
  virtual DeviceInfo info() = 0;

  /// The image is brought only when it is wanted.
  virtual ChannelAnswer send(const Message &message, const std::string &request,
                             bool wants_image) = 0;

  /// What the device logged since it was last asked, where that is to be had.
  virtual std::string take_log() { return ""; }
};

/// A device on this machine, which is this process's alone while the channel lives. One that is not
/// there is made, and a line on standard error says so; with `must_exist` that is a
/// tools::UsageError.
std::unique_ptr<Channel> open_local_device(const std::string &state_directory, bool must_exist);

/// A device that is served over HTTP below `url`. `ca_file` has the only roots to trust for https;
/// empty: those of the system. Throws tools::UsageError for a URL or a file that is none.
std::unique_ptr<Channel> open_served_device(const std::string &url, const std::string &ca_file);

}  // namespace tsm

#endif
