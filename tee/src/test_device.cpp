// SPDX-License-Identifier: BSD-2-Clause
#include <tee_test.h>

#include <atomic>
#include <stdexcept>

#include "error.h"
#include "host_device.h"
#include "power_switch.h"
#include "rsa_key.h"

namespace tee::test {

namespace {

Program program_of(const TaProperties &properties, const tee_ta_entry_points &entry_points) {
  return {
      .uuid = properties.uuid,
      .data_size = properties.data_size,
      .trace_prefix = properties.trace_prefix,
      .trace_level = properties.trace_level,
      .entry_points = entry_points,
      .image = nullptr,
  };
}

// No path begins with these characters by accident.
std::string fresh_name() {
  static std::atomic<unsigned> last = 0;
  return "//memory/" + std::to_string(++last);
}

constexpr TEE_Identity kNormalWorld = {TEE_LOGIN_PUBLIC, {}};

}  // namespace

struct Device::Impl {
  std::string name;
  std::shared_ptr<HostDevice> device;
  PowerSwitch *power;  // the device's storage

  Impl(std::string device_name, std::shared_ptr<HostDevice> host)
      : name(std::move(device_name)), device(std::move(host)) {
    auto storage = std::make_unique<PowerSwitch>(std::move(device->storage), device->faults);
    power = storage.get();
    device->storage = std::move(storage);
  }
  ~Impl() { release_device(device); }
};

Device::Device()
    : impl_(std::make_unique<Impl>(
          fresh_name(), std::make_shared<HostDevice>(std::make_unique<MemoryStorage>()))) {
  name_device(impl_->name, impl_->device);
}

Device::Device(const std::string &state_directory) {
  try {
    impl_ = std::make_unique<Impl>(state_directory, open_device(state_directory));
  } catch (const Error &error) {
    throw std::runtime_error(error.why);
  }
}

Device::~Device() = default;

const char *Device::name() const {
  return impl_->name.c_str();
}

void Device::register_ta(const TaProperties &properties, const tee_ta_entry_points &entry_points) {
  impl_->device->register_program(program_of(properties, entry_points));
}

void Device::fail(const TEE_UUID &uuid, Fault fault, unsigned nth, bool and_after,
                  TEE_Result code) {
  impl_->device->faults.set(uuid_bytes(uuid), fault, nth, and_after, code);
}

void Device::clear_faults() {
  impl_->device->faults.clear();
}

FaultReport Device::fault_report() const {
  return impl_->device->faults.report();
}

void Device::restore_power() {
  const std::lock_guard guard(impl_->device->lock);
  impl_->power->restore();
}

void Device::watch_freed(std::function<void(std::string_view bytes)> look) {
  const std::lock_guard guard(impl_->device->lock);
  impl_->device->watch_freed = std::move(look);
}

void Device::create_at_once(bool at_once) {
  const std::lock_guard guard(impl_->device->lock);
  impl_->device->creates_at_once = at_once;
}

std::map<std::string, std::string> Device::objects(const TEE_UUID &uuid) const {
  const std::lock_guard guard(impl_->device->lock);
  const UuidBytes ta = uuid_bytes(uuid);
  std::map<std::string, std::string> objects;
  for (const ObjectListing &object : impl_->power->list(ta)) {
    const Bytes data = impl_->power->load({ta, object.id}).value();
    objects[object.id] = std::string(data.begin(), data.end());
  }
  return objects;
}

void Device::put_object(const TEE_UUID &uuid, const std::string &id, const std::string &data) {
  const std::lock_guard guard(impl_->device->lock);
  const ByteView bytes(reinterpret_cast<const uint8_t *>(data.data()), data.size());
  impl_->power->medium().save({uuid_bytes(uuid), id}, bytes);
}

void Device::remove_object(const TEE_UUID &uuid, const std::string &id) {
  const std::lock_guard guard(impl_->device->lock);
  impl_->power->medium().remove({uuid_bytes(uuid), id});
}

uint64_t Device::durable_writes() const {
  const std::lock_guard guard(impl_->device->lock);
  return impl_->power->durable_writes();
}

void reuse_generated_keys(unsigned count, const std::string &folder) {
  tee::reuse_generated_keys(count, folder);
}

struct InsideTa::Impl {
  std::shared_ptr<HostDevice> device;
  std::lock_guard<std::recursive_mutex> entered{device->lock};
  Instance instance;
  Running running;

  Impl(std::shared_ptr<HostDevice> on_device, const TaProperties &properties)
      : device(std::move(on_device)),
        instance(*device, program_of(properties, {})),
        running(instance, &kNormalWorld) {}
};

InsideTa::InsideTa(Device &device, const TaProperties &properties)
    : impl_(std::make_unique<Impl>(device.impl()->device, properties)) {}

InsideTa::~InsideTa() = default;

tee_heap_stats InsideTa::stats() const {
  return impl_->instance.stats();
}

}  // namespace tee::test
