// SPDX-License-Identifier: BSD-2-Clause
/// For tests only: devices in memory, trusted applications given as functions, faults on order,
/// a power cut, and a sink for log lines.
#ifndef TEE_TEST_H
#define TEE_TEST_H

#include <tee_inspect.h>
#include <tee_ta_image.h>

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace tee::test {

/// What may be made to go wrong.
enum class Fault {
  kAllocation,  // TEE_Malloc returns NULL
  kStorage,     // a persistent-object call (open, create, read, write, close-and-delete) fails
  kCrypto,      // a transient-object, operation or cryptographic call that can fail does
  kTaCall,      // TEE_OpenTASession or TEE_InvokeTACommand fails
  kShortRead,   // TEE_ReadObjectData succeeds with half of the bytes
  kPowerCut,    // the n-th durable write and everything durable after it never happens
  kFullHeap,    // TEE_Malloc returns NULL where more than n bytes of heap would be in use
};

/// Tells of the latest fault: what was hit, for messages of a failing sweep.
struct FaultReport {
  bool fired = false;  // a plan has been carried out since the last was made
  std::string call;    // "TEE_WriteObjectData"; of a power cut what it met: "save ID", "remove ID"
  uint32_t heap_in_use = 0;  // the most bytes that a kFullHeap plan has let be in use
};

/// What an image's header would say of a trusted application.
struct TaProperties {
  TEE_UUID uuid{};                        // whose objects it sees
  uint32_t data_size = 0x200000;          // bytes of heap
  uint32_t stack_size = 0x2000;           // bytes; nothing enforces it
  std::string trace_prefix = "TA: test";  // begins its log lines
  uint32_t trace_level = 1;               // highest TEE_TRACE_* that appears
};

/// A device whose objects live in memory, or in a state directory. Its name is a context name for
/// TEEC_InitializeContext(). Objects outlive contexts, sessions and instances; in memory they end
/// with the Device.
class Device {
 public:
  Device();

  /// With the database of `state_directory`; throws std::runtime_error when it cannot be opened.
  explicit Device(const std::string &state_directory);
  ~Device();
  Device(const Device &) = delete;
  Device &operator=(const Device &) = delete;

  /// The context name; lives as long as the Device.
  const char *name() const;

  /// Uses these functions as the trusted application `properties.uuid` in place of an image.
  void register_ta(const TaProperties &properties, const tee_ta_entry_points &entry_points);

  /// The `nth` call (1 is the next) of kind `fault` that instances of `uuid` make fails with
  /// `code` (0: the natural one of that kind); with `and_after` every later one, too. Replaces an
  /// earlier plan of the same kind. A kFullHeap plan counts bytes and holds until it is dropped;
  /// any limit from the report's `heap_in_use` up to its own would have done the same.
  void fail(const TEE_UUID &uuid, Fault fault, unsigned nth, bool and_after = false,
            TEE_Result code = 0);

  /// Drops all plans, and the report.
  void clear_faults();

  /// What the plans have hit since the last was made.
  FaultReport fault_report() const;

  /// After kPowerCut fired: gives back what storage really holds and lets writes happen again.
  void restore_power();

  /// Shows `look` each block of heap that a trusted application gives back, with the bytes that are
  /// in it then.
  void watch_freed(std::function<void(std::string_view bytes)> look);

  /// Makes a creation without data durable in its own call, as many TEEs do. Otherwise it waits for
  /// the first write or the close of its handle.
  void create_at_once(bool at_once);

  /// All objects of a trusted application: ID to raw data stream.
  std::map<std::string, std::string> objects(const TEE_UUID &uuid) const;

  /// Creates or replaces an object, past all faults.
  void put_object(const TEE_UUID &uuid, const std::string &id, const std::string &data);

  /// Removes an object, if there is one, past all faults.
  void remove_object(const TEE_UUID &uuid, const std::string &id);

  /// Durable writes (creations, writes, deletions) so far, of all TAs.
  uint64_t durable_writes() const;

  struct Impl;

  /// The host TEE's own.
  Impl *impl() const { return impl_.get(); }

 private:
  std::unique_ptr<Impl> impl_;
};

/// Makes this thread run as an instance of a trusted application of `device` while it lives, so
/// that a unit test may call TEE_* functions, or code that does, directly. Other threads do not
/// enter the device meanwhile.
class InsideTa {
 public:
  /// An instance with a heap of its own; its entry points are not called. `device` must live
  /// longer.
  explicit InsideTa(Device &device, const TaProperties &properties = {});
  ~InsideTa();
  InsideTa(const InsideTa &) = delete;
  InsideTa &operator=(const InsideTa &) = delete;

  /// Figures of the instance.
  tee_heap_stats stats() const;

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

/// Collects log lines while it lives, in place of standard error. Sinks nest.
class TraceSink {
 public:
  TraceSink();
  ~TraceSink();
  TraceSink(const TraceSink &) = delete;
  TraceSink &operator=(const TraceSink &) = delete;

  /// One call of tee_trace() that its level let through.
  struct Line {
    std::string tag;       // "ERR"
    std::string function;  // "init_dsi"
    std::string message;   // formatted, without a final line feed
  };

  /// The lines so far, oldest first.
  const std::vector<Line> &lines() const;

  /// Forgets them.
  void clear();

  struct Impl;

 private:
  std::unique_ptr<Impl> impl_;
};

/// RSA keys are slow to make. From here on the first `count` keys that are generated of a size
/// serve again and again, in turn, in this process; 0 makes every key a new one again. With a
/// `folder` for their files, all processes that name it have the same ones.
void reuse_generated_keys(unsigned count, const std::string &folder = {});

/// Names the folder from which TA images are loaded, before the places that programs look in.
void set_ta_directory(const std::string &directory);

}  // namespace tee::test

#endif
