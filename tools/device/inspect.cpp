// SPDX-License-Identifier: BSD-2-Clause
#include "device/inspect.h"

#include <tee_inspect.h>

#include <cstdlib>
#include <exception>
#include <memory>

namespace device {
namespace {

struct FreedByC {
  void operator()(uint8_t *bytes) const { free(bytes); }
};

void check(TEEC_Result result, std::string_view action) {
  const bool is_missing = result == TEEC_ERROR_ITEM_NOT_FOUND;
  if (result != TEEC_SUCCESS) {
    throw Error(action, result, Origin::kTee, is_missing ? "the agent has no such object" : "");
  }
}

std::string last_error() {
  return tee_inspect_last_error();
}

std::vector<Figure> heap_figures(Device &device) {
  tee_heap_stats stats;
  const TEEC_Result result = tee_inspect_stats(device.context(), &kAgentUuid, &stats);
  if (result == TEEC_ERROR_ITEM_NOT_FOUND) return {};
  check(result, "cannot read the heap's figures");
  return {{"heap_size", stats.size},
          {"heap_in_use", stats.in_use},
          {"heap_peak", stats.peak},
          {"live_blocks", stats.live_blocks},
          {"peak_blocks", stats.peak_blocks},
          {"open_objects", stats.open_objects},
          {"open_operations", stats.open_operations},
          {"open_sessions", stats.open_sessions}};
}

struct Listing {
  std::vector<StoredObject> objects;
  std::exception_ptr failure;  // must not cross the C function that calls back
};

bool add_object(void *closure, const void *id, size_t id_len, size_t data_len) {
  Listing *listing = static_cast<Listing *>(closure);
  try {
    listing->objects.push_back({std::string(static_cast<const char *>(id), id_len), data_len});
  } catch (...) {
    listing->failure = std::current_exception();
  }
  return !listing->failure;
}

std::vector<StoredObject> list_objects(Device &device) {
  Listing listing;
  check(tee_inspect_list(device.context(), &kAgentUuid, add_object, &listing),
        "cannot list the agent's objects");
  if (listing.failure) std::rethrow_exception(listing.failure);
  return listing.objects;
}

std::string get_object(Device &device, std::string_view id) {
  uint8_t *data = nullptr;
  size_t data_len = 0;
  check(tee_inspect_get(device.context(), &kAgentUuid, id.data(), id.size(), &data, &data_len),
        "cannot read the object");
  const std::unique_ptr<uint8_t, FreedByC> owner(data);
  return std::string(reinterpret_cast<const char *>(data), data_len);
}

void put_object(Device &device, std::string_view id, std::string_view data) {
  check(tee_inspect_put(device.context(), &kAgentUuid, id.data(), id.size(), data.data(),
                        data.size()),
        "cannot write the object");
}

void remove_object(Device &device, std::string_view id) {
  check(tee_inspect_remove(device.context(), &kAgentUuid, id.data(), id.size()),
        "cannot remove the object");
}

void add_line(void *closure, const char *line, size_t len) {
  static_cast<std::string *>(closure)->append(line, len);
}

void collect_trace(std::string *lines) {
  tee_inspect_trace(lines == nullptr ? nullptr : add_line, lines);
}

constexpr Inspection kInspection = {
    .last_error = last_error,
    .heap_figures = heap_figures,
    .list_objects = list_objects,
    .get_object = get_object,
    .put_object = put_object,
    .remove_object = remove_object,
    .collect_trace = collect_trace,
};

}  // namespace

const Inspection *inspection() {
  return &kInspection;
}

}  // namespace device
