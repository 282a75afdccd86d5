// SPDX-License-Identifier: BSD-2-Clause
/// What is behind a TEEC_Context.
#ifndef TEE_CLIENT_CONTEXT_H
#define TEE_CLIENT_CONTEXT_H

#include <tee_client_api.h>

#include "error.h"
#include "host_device.h"

namespace tee {

/// A share of the device, for contexts and sessions of the normal world.
class DeviceShare {
 public:
  explicit DeviceShare(std::shared_ptr<HostDevice> device) : device_(std::move(device)) {}
  DeviceShare(const DeviceShare &) = default;
  DeviceShare &operator=(const DeviceShare &) = delete;
  ~DeviceShare() { release_device(device_); }

  HostDevice &operator*() const { return *device_; }
  HostDevice *operator->() const { return device_.get(); }

 private:
  std::shared_ptr<HostDevice> device_;
};

struct ClientContext {
  DeviceShare device;
};

inline const DeviceShare &device_of(const TEEC_Context *context) {
  if (context == nullptr || context->imp == nullptr) {
    throw Error{TEE_ERROR_BAD_PARAMETERS, "context is not initialized"};
  }
  return static_cast<const ClientContext *>(context->imp)->device;
}

}  // namespace tee

#endif
