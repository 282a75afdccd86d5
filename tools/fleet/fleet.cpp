// SPDX-License-Identifier: BSD-2-Clause
#include "fleet/fleet.h"

#include <atomic>
#include <cstdio>
#include <fstream>
#include <nlohmann/json.hpp>

#include "common/encoding.h"
#include "common/error_line.h"
#include "common/files.h"
#include "device/device_client.h"
#include "device/info_json.h"
#include "device/inspect.h"
#include "device/object_id.h"
#include "fleet/parallel.h"

namespace fleet {
namespace {

namespace fs = std::filesystem;

std::string name_of(size_t index) {
  char name[40];
  snprintf(name, sizeof(name), "device-%05zu", index + 1);
  return name;
}

fs::path list_of(const fs::path &root) {
  return root / "devices.jsonl";
}

fs::path info_of(const fs::path &root, const std::string &name) {
  return root / "made" / (name + ".json");
}

/// A copy under another name first, so that one that was interrupted is not taken for a device.
void copy_made(const fs::path &root, const std::string &name) {
  const fs::path state = root / "state" / name;
  const fs::path copy = root / "state" / (name + ".new");
  fs::remove_all(copy);
  fs::copy(root / "made" / name, copy, fs::copy_options::recursive);
  fs::permissions(copy, fs::perms::owner_all);
  fs::remove_all(state);
  fs::rename(copy, state);
}

void make_device(const fs::path &root, const std::string &name) {
  if (!fs::exists(info_of(root, name))) {
    device::Device made((root / "made" / name).string());
    tools::write_file(info_of(root, name).string(), device::info_json(device::read_info(made)));
  }
  if (!fs::exists(root / "state" / name)) copy_made(root, name);
}

/// In one line, as it stands in the list.
std::string named_info(const fs::path &root, const std::string &name) {
  nlohmann::ordered_json line = {{"name", name}};
  line.update(nlohmann::ordered_json::parse(tools::read_file(info_of(root, name).string())));
  return line.dump() + "\n";
}

template <class Job>
void for_each_name(size_t count, size_t num_threads, const Progress &progress, Job &&job) {
  std::atomic<size_t> num_done = 0;
  const auto work = [&](size_t index) {
    job(index);
    ++num_done;
  };
  for_each(count, num_threads, work, [&] { progress(num_done); });
  progress(num_done);
}

}  // namespace

void make_fleet(const fs::path &root, size_t count, size_t num_threads, const Progress &progress) {
  fs::create_directories(root / "made");
  fs::create_directories(root / "state");
  for_each_name(count, num_threads, progress,
                [&](size_t index) { make_device(root, name_of(index)); });
  std::string list;
  for (size_t index = 0; index < count || fs::exists(info_of(root, name_of(index))); ++index) {
    list += named_info(root, name_of(index));
  }
  tools::write_file(list_of(root).string(), list);
}

void reset_fleet(const fs::path &root, size_t num_threads, const Progress &progress) {
  const std::vector<Member> members = members_of(root);
  for_each_name(members.size(), num_threads, progress,
                [&](size_t index) { copy_made(root, members[index].name); });
}

void list_objects(const fs::path &root,
                  const std::function<void(const std::string &lines)> &print) {
  const device::Inspection *inspection = device::inspection();
  if (inspection == nullptr) throw tools::UsageError("objects needs a TEE that shows them");
  for (const Member &member : members_of(root)) {
    device::Device device(member.state_directory.string());
    std::string lines;
    for (const device::StoredObject &object : inspection->list_objects(device)) {
      lines += member.name + "\t" + device::show_object_id(object.id) + "\t" +
               tools::base64_encode(inspection->get_object(device, object.id)) + "\n";
    }
    print(lines);
  }
}

std::vector<Member> members_of(const fs::path &root) {
  std::ifstream lines(list_of(root));
  std::vector<Member> members;
  for (std::string line; std::getline(lines, line);) {
    const nlohmann::json info = nlohmann::json::parse(line, nullptr, false);
    const std::string name = info.is_object() ? info.value("name", "") : "";
    const std::string id = info.is_object() ? info.value("device_id", "") : "";
    if (name.empty() || id.empty()) {
      throw tools::UsageError("bad line in " + list_of(root).string() + ": " + line);
    }
    members.push_back({name, id, root / "state" / name});
  }
  if (!members.empty()) return members;
  throw tools::UsageError("no devices in " + root.string() +
                          ": expected some, as `otrp-fleet make` makes them");
}

}  // namespace fleet
