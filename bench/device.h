// SPDX-License-Identifier: BSD-2-Clause
/// Devices to measure, and single exchanges with them.
#ifndef BENCH_DEVICE_H
#define BENCH_DEVICE_H

#include <memory>
#include <string>
#include <vector>

#include "device/device_client.h"
#include "suite.h"
#include "support/scene.h"

namespace bench {

using otrp_test::Scene;
using otrp_test::Snapshot;
using tsm::MessageId;

/// A message as the benchmark sends it, again and again: `arrange` before it and `restore` after it
/// bring the device back to where it was.
struct MessageCase {
  std::string name;
  MessageId id;
  tsm::RequestOptions options;
  void (*arrange)(Scene &) = nullptr;
  void (*restore)(Scene &) = nullptr;
};

/// Every message but the one that makes a key; InstallTA and UpdateTA with images of `image_len`
/// bytes.
std::vector<MessageCase> message_cases(size_t image_len = 4096);
MessageCase message_case(MessageId id, size_t image_len = 4096);

/// What a device keeps that has `num_sds` SDs of one SP with two TAs each. "sd1" and its TAs "ta1"
/// and "ta2" were really created, on `first`; the others are copies of their records.
Snapshot filled(const Snapshot &first, size_t num_sds);

/// A device with "sd1", "ta1" and "ta2".
void make_first_sd(Scene &scene);

/// A device in memory in the state of `first` with the objects of `snapshot`, started, and a TSM
/// that knows its state; NULL when it does not start or tell.
std::shared_ptr<Scene> start(const Scene &first, const Snapshot &snapshot);

/// A started device with `num_sds` SDs.
std::shared_ptr<Scene> filled_device(size_t num_sds);

/// One message to one device through the Client API, with all buffers made beforehand.
class Exchange {
 public:
  Exchange(std::shared_ptr<Scene> scene, MessageCase message);
  Exchange(const Exchange &) = delete;
  Exchange &operator=(const Exchange &) = delete;

  void before();
  void run();
  /// Throws when the device has not carried the message out.
  void after();

  /// The whole of it; false when the device has not carried the message out.
  bool try_once();
  const Scene &scene() const { return *scene_; }
  const std::string &request() const { return request_; }
  const std::string &response() const { return response_; }

 private:
  bool read_answer();

  const std::shared_ptr<Scene> scene_;
  const MessageCase message_;
  device::Session session_;
  std::string request_;
  std::string frame_;
  std::vector<char> output_;
  TEEC_Operation operation_{};
  TEEC_Result result_ = 0;
  std::string response_;
};

Contestant contestant(const std::string &name, const std::shared_ptr<Exchange> &exchange);

}  // namespace bench

#endif
