// SPDX-License-Identifier: BSD-2-Clause
#include "device/agent_log.h"
#include "device/device_client.h"
#include "device/state_directory.h"
#include "tsm/cli/channel.h"
#include "tsm/protocol/response.h"

namespace tsm {
namespace {

class LocalChannel : public Channel {
 public:
  LocalChannel(const std::string &state_directory, bool must_exist)
      : device_(state_directory, must_exist) {}

  DeviceInfo info() override {
    const device::Info info = with_device([&] { return device::read_info(device_); });
    const std::optional<RsaKey> tee_key = RsaKey::from_encoded(info.tee_public_key);
    if (!tee_key) throw NotVerified("the device's TEE key is no RSA key");
    return {info.device_id, *tee_key};
  }

  ChannelAnswer send(const Message &message, const std::string &request, bool) override {
    return with_device([&] {
      const device::Message &known = *device::find_message(message.command);
      device::Session agent(device_, device::kAgentUuid);
      device::Answer answer = device::send(agent, known, request);
      return ChannelAnswer{std::move(answer.response), std::move(answer.image),
                           failure_of(known, answer), answer.status};
    });
  }

  std::string take_log() override { return std::exchange(log_, {}); }

 private:
  /// Runs a step with the device; what fails there is told as a channel's failure.
  template <class Step>
  auto with_device(Step &&step) -> decltype(step()) {
    device::AgentLog log(false);
    try {
      auto result = step();
      log_ += log.take();
      return result;
    } catch (const device::Error &error) {
      log_ += log.take();
      throw ChannelError(error.what(), error.code());
    }
  }

  static std::string failure_of(const device::Message &message, const device::Answer &answer) {
    try {
      device::require_success(message, answer);
      return "";
    } catch (const device::Error &error) {
      return error.what();
    }
  }

  device::StateDevice device_;
  std::string log_;
};

}  // namespace

std::unique_ptr<Channel> open_local_device(const std::string &state_directory, bool must_exist) {
  try {
    return std::make_unique<LocalChannel>(state_directory, must_exist);
  } catch (const device::Error &error) {
    throw NoAnswer(error.what());
  }
}

}  // namespace tsm
