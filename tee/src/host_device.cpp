// SPDX-License-Identifier: BSD-2-Clause
#include "host_device.h"

#include "loaded_image.h"
#include "loader.h"

namespace tee {

void HostDevice::register_program(Program program) {
  const std::lock_guard guard(lock);
  registered_.insert_or_assign(uuid_bytes(program.uuid), std::move(program));
}

TEE_Result HostDevice::open_session(const TEE_UUID &ta, const TEE_Identity &client,
                                    Message &message, std::unique_ptr<Session> &session) {
  const std::lock_guard guard(lock);
  auto fresh = std::make_unique<Session>(Session{nullptr, client, nullptr});
  const TEE_Result created = find_or_create(ta, &fresh->instance);
  if (created != TEE_SUCCESS) return created;

  Instance &instance = *fresh->instance;
  ++instance.num_clients;
  TEE_Result result;
  {
    const Running running(instance, &fresh->client, &message);
    message.origin = TEE_ORIGIN_TRUSTED_APP;
    result =
        instance.program.entry_points.open_session(message.types, message.params, &fresh->context);
  }
  if (result != TEE_SUCCESS) {
    drop_client(instance);
    return result;
  }
  session = std::move(fresh);
  return TEE_SUCCESS;
}

TEE_Result HostDevice::invoke(Session &session, uint32_t command, Message &message) {
  const std::lock_guard guard(lock);
  if (session.instance->entered) return TEE_ERROR_BUSY;
  const Running running(*session.instance, &session.client, &message);
  message.origin = TEE_ORIGIN_TRUSTED_APP;
  return session.instance->program.entry_points.invoke_command(session.context, command,
                                                               message.types, message.params);
}

void HostDevice::close_session(std::unique_ptr<Session> session) {
  const std::lock_guard guard(lock);
  Instance &instance = *session->instance;
  if (instance.entered) panic("close session", "from inside the same instance");
  {
    const Running running(instance, &session->client);
    instance.program.entry_points.close_session(session->context);
  }
  drop_client(instance);
}

Instance *HostDevice::find_instance(const UuidBytes &ta) {
  const auto found = instances_.find(ta);
  return found != instances_.end() ? found->second.get() : nullptr;
}

Program HostDevice::program_of(const TEE_UUID &ta) {
  const UuidBytes uuid = uuid_bytes(ta);
  if (const auto found = registered_.find(uuid); found != registered_.end()) return found->second;
  auto resting = resting_.extract(uuid);
  const bool usable = resting && resting.mapped().image->reset();
  return usable ? std::move(resting.mapped()) : load_program(ta);
}

// A trusted application that asks another one does so again. As long as it lives, the other one's
// next instances run what the first one ran, which need not be looked for.
void HostDevice::rest(Program program) noexcept {
  if (instances_.empty()) {
    resting_.clear();
  } else if (program.image) {
    try {
      resting_.insert_or_assign(uuid_bytes(program.uuid), std::move(program));
    } catch (const std::bad_alloc &) {
      // The next one is looked for.
    }
  }
}

TEE_Result HostDevice::find_or_create(const TEE_UUID &ta, Instance **instance) {
  const UuidBytes uuid = uuid_bytes(ta);
  *instance = find_instance(uuid);
  if (*instance != nullptr) return (*instance)->entered ? TEE_ERROR_BUSY : TEE_SUCCESS;

  const auto fresh = instances_.emplace(uuid, std::make_unique<Instance>(*this, program_of(ta)));
  *instance = fresh.first->second.get();
  TEE_Result result;
  {
    const Running running(**instance);
    result = (*instance)->program.entry_points.create();
  }
  if (result != TEE_SUCCESS) instances_.extract(uuid);
  return result;
}

// While its last entry point runs, the instance is still the one of its UUID; when it gives back
// what was left open, which may enter others, it is no more.
void HostDevice::drop_client(Instance &instance) {
  if (--instance.num_clients != 0) return;
  {
    const Running running(instance);
    instance.program.entry_points.destroy();
  }
  Program program = std::move(instance.program);
  instances_.extract(instance.uuid);
  rest(std::move(program));
}

}  // namespace tee
