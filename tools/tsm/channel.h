// SPDX-License-Identifier: BSD-2-Clause
/// The way to a device: where requests go and answers come from.
#ifndef TSM_CHANNEL_H
#define TSM_CHANNEL_H

#include <memory>
#include <optional>
#include <stdexcept>
#include <string>

#include "tsm/messages.h"
#include "tsm/parties.h"

namespace tsm {

/// The device did not answer, or only said that it failed. One line.
class ChannelError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
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
};

/// A device on this machine, which is this process's alone while the channel lives.
std::unique_ptr<Channel> open_local_device(const std::string &state_directory);

/// A device that is served over HTTP below `url`. `ca_file` has the only roots to trust for https;
/// empty: those of the system. Throws tools::UsageError for a URL or a file that is none.
std::unique_ptr<Channel> open_served_device(const std::string &url, const std::string &ca_file);

}  // namespace tsm

#endif
