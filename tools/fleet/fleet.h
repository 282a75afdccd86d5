// SPDX-License-Identifier: BSD-2-Clause
/// Devices of the host TEE in a folder:
///
///     ROOT/made/NAME/       a device as it was made: its key and its ID, which take long
///     ROOT/made/NAME.json   its device file, as `otrp-device info` prints it
///     ROOT/state/NAME/      the device as it is now
///     ROOT/devices.jsonl    the device files of all with their names, a line each
///
/// Names are device-00001 and so on.
#ifndef FLEET_FLEET_H
#define FLEET_FLEET_H

#include <filesystem>
#include <functional>
#include <string>
#include <vector>

namespace fleet {

struct Member {
  std::string name;
  std::string device_id;
  std::filesystem::path state_directory;
};

/// Called now and then with what is done so far.
using Progress = std::function<void(size_t num_done)>;

/// Makes those of the first `count` devices that are missing, keys and all, in `num_threads`
/// threads. What is there stays as it is.
void make_fleet(const std::filesystem::path &root, size_t count, size_t num_threads,
                const Progress &progress);

/// All devices become again what they were when they were made. None may be in use.
void reset_fleet(const std::filesystem::path &root, size_t num_threads, const Progress &progress);

/// In the order of their names. Throws tools::UsageError where there are none.
std::vector<Member> members_of(const std::filesystem::path &root);

/// `print` gets, of one device after the other, a line for each object that its agent has stored:
/// the device's name, the object's ID and its content in base64, with tabs between. Throws
/// tools::UsageError where the TEE lets nobody look.
void list_objects(const std::filesystem::path &root,
                  const std::function<void(const std::string &lines)> &print);

}  // namespace fleet

#endif
