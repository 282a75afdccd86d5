// SPDX-License-Identifier: BSD-2-Clause
#include <cstdlib>
#include <utility>

#include "common/error_line.h"
#include "http/client.h"
#include "tsm/cli/channel.h"

namespace tsm {
namespace {

constexpr char kOtrpJson[] = "application/otrp+json";
constexpr char kImageHeader[] = "OTrP-TA-Image";
constexpr int kOk = 200;
constexpr size_t kMaxShownLen = 500;

/// What stands before the paths of the service. Its URL may end in a slash or in the messages' own
/// path.
std::string base_of(std::string url) {
  const auto drop = [&](std::string_view end) {
    if (url.ends_with(end)) url.resize(url.size() - end.size());
  };
  if (!url.starts_with("http://") && !url.starts_with("https://")) {
    throw tools::UsageError("bad URL \"" + url + "\": expected http://... or https://...");
  }
  if (url.find_first_of("?#") != std::string::npos) {
    throw tools::UsageError("bad URL \"" + url + "\": expected one without ? and #");
  }
  drop("/");
  drop("/otrp");
  return url;
}

/// A device's failure says itself what failed; anything else is told with the address.
ChannelAnswer failure_of(const http::Reply &reply) {
  const std::optional<Json> body = parse_json(reply.body);
  const std::string *message = body ? find_string(*body, "message") : nullptr;
  const std::string *code = body ? find_string(*body, "code") : nullptr;
  const std::string text = message == nullptr ? "" : message->substr(0, kMaxShownLen);
  if (message != nullptr && code != nullptr) {
    const auto number = static_cast<uint32_t>(std::strtoul(code->c_str(), nullptr, 0));
    return {.response = "", .image = {}, .failure = text, .code = number};
  }
  const std::string expected = "expected the service of a device, as `otrp-device serve` is";
  return {.response = "",
          .image = {},
          .failure = reply.url + ": " + std::to_string(reply.status) + " " +
                     std::string(http::reason_of(reply.status)) + ": " +
                     (text.empty() ? expected : text)};
}

class HttpChannel : public Channel {
 public:
  HttpChannel(const std::string &url, const std::string &ca_file)
      : base_(base_of(url)), client_({.ca_file = ca_file, .user_agent = "otrp-tsm"}) {}

  DeviceInfo info() override {
    const std::string text = get("/info");
    try {
      return parse_device_info(text);
    } catch (const tools::UsageError &error) {
      throw ChannelError(base_ + "/info: " + error.what());
    }
  }

  ChannelAnswer send(const Message &, const std::string &request, bool wants_image) override {
    const http::Reply reply = call({.method = "POST",
                                    .url = base_ + "/otrp",
                                    .headers = {{"Content-Type", kOtrpJson}, {"Accept", kOtrpJson}},
                                    .body = request});
    if (reply.status != kOk) return failure_of(reply);
    if (reply.body.empty()) throw NoAnswer(reply.url + ": an answer without a response");
    ChannelAnswer answer = {.response = reply.body, .image = {}, .failure = ""};
    const std::string *path = http::find_header(reply.headers, kImageHeader);
    // A path: no other host can be named with it.
    if (wants_image && path != nullptr && path->starts_with("/")) fetch_image(*path, &answer);
    return answer;
  }

 private:
  std::string get(const std::string &path) {
    http::Reply reply = call({.method = "GET", .url = base_ + path});
    if (reply.status != kOk) throw ChannelError(failure_of(reply).failure);
    return std::move(reply.body);
  }

  /// Whatever becomes of the image, the response is the proof of what the device has done.
  void fetch_image(const std::string &path, ChannelAnswer *answer) {
    try {
      answer->image = get(path);
    } catch (const ChannelError &error) {
      answer->failure = std::string("the TA image was not handed back: ") + error.what();
    }
  }

  http::Reply call(const http::Call &call) {
    try {
      return client_.send(call);
    } catch (const http::ClientError &error) {
      const bool was_sent =
          error.failure() != http::Failure::kNoConnection && error.failure() != http::Failure::kTls;
      const bool may_be_done = was_sent && call.method == "POST";
      throw NoAnswer(error.what() +
                     std::string(may_be_done ? "; the device may have done it: get-device-state "
                                               "tells"
                                             : ""));
    }
  }

  std::string base_;
  http::Client client_;
};

}  // namespace

std::unique_ptr<Channel> open_served_device(const std::string &url, const std::string &ca_file) {
  return std::make_unique<HttpChannel>(url, ca_file);
}

}  // namespace tsm
