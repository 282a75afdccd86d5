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

  virtual ChannelAnswer send(const Message &message, const std::string &request) = 0;
};

/// A device on this machine, which is this process's alone while the channel lives.
std::unique_ptr<Channel> open_local_device(const std::string &state_directory);

}  // namespace tsm

#endif
