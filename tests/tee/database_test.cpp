// SPDX-License-Identifier: BSD-2-Clause
// State directories: who may use them, what a crash leaves, what happens to damaged ones.
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "common/files.h"
#include "tee_support.h"

using namespace tee::test;

// SQLite's calls end here.
static bool g_disk_is_broken = false;
extern "C" int fdatasync(int file) {
  if (!g_disk_is_broken) return ::fsync(file);
  errno = EIO;
  return -1;
}

namespace fs = std::filesystem;

namespace {

class StateDirectory : public testing::Test {
 protected:
  // A closed directory with some objects, one of them over many pages.
  void fill() const {
    Device device(state);
    for (int i = 0; i < 50; ++i) device.put_object({}, "id" + std::to_string(i), "small object");
    device.put_object({}, "large", std::string(100000, 'L'));
  }
  std::string stored(const std::string &id) const { return Device(state).objects({})[id]; }

  TemporaryFolder folder;
  const fs::path state = folder.path / "a" / "b";
  const fs::path database = state / "objects.db";
  const fs::path log = state / "objects.db-wal";
};

TEST_F(StateDirectory, IsItsOwnersAloneAndOneFileWhenClosed) {
  const mode_t mask = ::umask(0);
  {
    Device device(state);
    device.put_object({}, "id", "data");
    for (const char *directory : {"..", "."}) {
      EXPECT_EQ(fs::status(state / directory).permissions(), fs::perms::owner_all);
    }
    for (const auto &file : fs::directory_iterator(state)) {
      EXPECT_EQ(file.status().permissions(), fs::perms::owner_read | fs::perms::owner_write);
    }
  }
  ::umask(mask);
  EXPECT_EQ(std::distance(fs::directory_iterator(state), {}), 2);  // the lock is the other
  fs::rename(state, folder.path / "moved");
  EXPECT_EQ(Device(folder.path / "moved").objects({})["id"], "data");
}

// ---- Several processes

// Runs `child` in a process of its own; its end is that process's.
template <class Child>
pid_t spawn(Child &&child) {
  const pid_t process = ::fork();
  if (process == 0) ::_exit(child());
  return process;
}

int exit_code_of(pid_t process) {
  int status = 0;
  ::waitpid(process, &status, 0);
  return WEXITSTATUS(status);
}

TEST_F(StateDirectory, BelongsToOneProcess) {
  const auto is_turned_away = [&] {
    const Client other(state);
    return other.result == TEEC_ERROR_BUSY && other.context.imp == nullptr &&
           tee_inspect_last_error() ==
               "state directory " + state.string() + " is in use by another process";
  };
  int ready[2];
  ASSERT_EQ(::pipe(ready), 0);
  const pid_t owner = spawn([&] {
    const Device device(state);
    return ::write(ready[1], "!", 1) == 1 ? ::pause() : 1;
  });
  char byte;
  ASSERT_EQ(::read(ready[0], &byte, 1), 1);
  EXPECT_TRUE(is_turned_away());
  ::kill(owner, SIGKILL);
  ::waitpid(owner, nullptr, 0);

  const Client first(state), second(state.string() + "/../b/");
  EXPECT_EQ(first.result, TEEC_SUCCESS);
  EXPECT_EQ(second.result, TEEC_SUCCESS);
  // Nor may a child go on with what its parent opened.
  EXPECT_EQ(exit_code_of(spawn(is_turned_away)), true);
}

// The first rounds meet the creation of the database.
TEST_F(StateDirectory, AProcessKilledAtAnyMomentLosesNothingThatWasStored) {
  for (useconds_t delay = 0; delay < 10000; delay += 500) {
    SCOPED_TRACE(delay);
    fs::remove_all(state);
    int told[2];
    ASSERT_EQ(::pipe(told), 0);
    const pid_t child = spawn([&] {
      Device device(state);
      for (uint32_t n = 1;; ++n) {
        device.put_object({}, "n", std::to_string(n));
        if (::write(told[1], &n, sizeof(n)) < 0) return 1;
      }
    });
    ::close(told[1]);
    ::usleep(delay);
    ::kill(child, SIGKILL);
    ::waitpid(child, nullptr, 0);
    uint32_t latest = 0;
    while (::read(told[0], &latest, sizeof(latest)) > 0) continue;
    ::close(told[0]);
    EXPECT_GE(std::stoul("0" + stored("n")), latest);
  }
}

// ---- Damage

TEST_F(StateDirectory, DamageIsReportedAndTheFileLeftAsItIs) {
  const std::pair<const char *, void (*)(std::string &)> kDamages[] = {
      {"NoDatabase", [](std::string &bytes) { bytes = "This is no database, but a text.\n"; }},
      {"OneByte", [](std::string &bytes) { bytes.resize(1); }},
      {"FirstPage", [](std::string &bytes) { bytes.resize(4096); }},
      {"HalfAPageMissing", [](std::string &bytes) { bytes.resize(bytes.size() - 2048); }},
      {"ForeignApplication", [](std::string &bytes) { bytes[68] ^= 1; }},
      {"OtherVersion", [](std::string &bytes) { bytes[63] ^= 2; }},
      {"OtherSchema", [](std::string &bytes) { bytes[bytes.find("digest BLOB")] = 'D'; }},
      {"ByteInsideAnObject", [](std::string &bytes) { bytes[bytes.rfind("LLLL")] ^= 1; }},
      {"ByteInsideAnId", [](std::string &bytes) { bytes[bytes.find("id49") + 1] ^= 1; }},
  };
  fill();
  const std::string sound = tools::read_file(database);
  for (const auto &[name, damage] : kDamages) {
    SCOPED_TRACE(name);
    std::string bytes = sound;
    damage(bytes);
    tools::write_file(database, bytes);
    EXPECT_EQ(Client(state).result, TEEC_ERROR_CORRUPT_OBJECT);
    EXPECT_NE(std::string(tee_inspect_last_error()).find("objects.db is damaged"),
              std::string::npos);
    EXPECT_TRUE(tools::read_file(database) == bytes);
    EXPECT_FALSE(fs::exists(log));
  }
}

TEST_F(StateDirectory, ALogLeftBehindIsRecoveredAndKeptBesideADamagedDatabase) {
  fill();
  exit_code_of(spawn([&] {
    (new Device(state))->put_object({}, "id1", "in the log");
    return 0;
  }));
  const std::string sound = tools::read_file(database), kept = tools::read_file(log);
  std::string changed = sound;
  changed[changed.rfind("LLLL")] ^= 1;
  for (const std::string &damaged : {changed, std::string()}) {
    tools::write_file(database, damaged);
    EXPECT_EQ(Client(state).result, TEEC_ERROR_CORRUPT_OBJECT);
    EXPECT_TRUE(tools::read_file(database) == damaged);
    EXPECT_TRUE(tools::read_file(log) == kept);
  }
  tools::write_file(database, sound);
  EXPECT_EQ(stored("id1"), "in the log");
}

// Each change is stored with a copy of what lies beside the database after it.
class LogLeftBehind : public StateDirectory {
 protected:
  LogLeftBehind() {
    fill();
    exit_code_of(spawn([&] {
      auto *device = new Device(state);
      for (int i = 0; i < kNumChanges; ++i) {
        device->put_object({}, "n", std::to_string(i));
        for (const fs::path &file : {log, count}) fs::copy_file(file, copy_of(file, i));
      }
      return 0;
    }));
    sound = tools::read_file(database);
  }
  fs::path copy_of(const fs::path &file, int i) const {
    return folder.path / (std::to_string(i) + file.extension().string());
  }
  std::string kept(const fs::path &file, int i) const { return tools::read_file(copy_of(file, i)); }

  static constexpr int kNumChanges = 5;
  const fs::path count = state / "objects.db-count";
  std::string sound;
};

TEST_F(LogLeftBehind, NoByteOfItChangesUnnoticed) {
  const std::string whole = tools::read_file(log);
  for (size_t at = 0; at < whole.size(); at += at < 100 ? 1 : 211) {
    SCOPED_TRACE(at);
    std::string changed = whole;
    changed[at] ^= 4;
    tools::write_file(log, changed);
    EXPECT_EQ(Client(state).result, TEEC_ERROR_CORRUPT_OBJECT);
    EXPECT_TRUE(tools::read_file(log) == changed);
  }
  fs::remove(log);
  EXPECT_EQ(Client(state).result, TEEC_ERROR_CORRUPT_OBJECT);
  EXPECT_EQ(Client(state).result, TEEC_ERROR_CORRUPT_OBJECT);  // and again
  EXPECT_TRUE(tools::read_file(database) == sound);
}

// The last change is torn, and the count may be one of long before.
TEST_F(LogLeftBehind, APowerCutRaisesNoAlarm) {
  for (int i = 0; i < kNumChanges; ++i) {
    const std::string next = kept(log, std::min(i + 1, kNumChanges - 1));
    const size_t len = kept(log, i).size();
    for (const size_t tail : {size_t{0}, size_t{1}, (next.size() - len) / 2, next.size() - len}) {
      for (const std::string &said : {kept(count, i), kept(count, 0), std::string(16, '\0')}) {
        SCOPED_TRACE(std::to_string(i) + ", " + std::to_string(tail));
        std::string torn = next.substr(0, len + tail);
        if (tail != 0) torn[len + tail / 2] ^= 1;
        tools::write_file(database, sound);
        tools::write_file(log, torn);
        tools::write_file(count, said);
        EXPECT_EQ(stored("n"), std::to_string(i));
      }
    }
  }
}

TEST_F(StateDirectory, NoFileInItBecomesAStandardStream) {
  const auto streams = [&] {
    for (int stream = 0; stream < 3; ++stream) ::close(stream);
    const Device device(state);
    int num_files = 0;
    for (const char *stream : {"0", "1", "2"}) {
      std::error_code error;
      const fs::path file = fs::read_symlink(fs::path("/proc/self/fd") / stream, error);
      num_files += file.parent_path() == state;
    }
    return num_files;
  };
  EXPECT_EQ(exit_code_of(spawn(streams)), 0);
}

TEST_F(StateDirectory, WhatCannotBeUsedIsRefused) {
  tools::write_file(folder.path / "file", "");
  EXPECT_EQ(Client(folder.path / "file").result, TEEC_ERROR_BAD_PARAMETERS);
  EXPECT_EQ(Client(folder.path / "file" / "state").result, TEEC_ERROR_BAD_PARAMETERS);
  EXPECT_EQ(Client("").result, TEEC_ERROR_BAD_PARAMETERS);
  fs::create_directories(database);
  EXPECT_EQ(Client(state).result, TEEC_ERROR_CORRUPT_OBJECT);
  fs::remove(database);
  tools::write_file(database, "");  // holds nothing: new
  EXPECT_EQ(Client(state).result, TEEC_SUCCESS);
  for (const fs::perms others : {fs::perms::group_write, fs::perms::others_write}) {
    fs::permissions(database, fs::perms::owner_read | fs::perms::owner_write | others);
    EXPECT_EQ(Client(state).result, TEEC_ERROR_ACCESS_DENIED);
    EXPECT_EQ(tee_inspect_last_error(),
              "database " + database.string() + " can be written by others");
  }
}

// ---- Storage that fails

// Files that cannot grow, as on a full disk, while it lives.
struct FullDisk {
  FullDisk() {
    ::signal(SIGXFSZ, SIG_IGN);
    ::getrlimit(RLIMIT_FSIZE, &before);
    const rlimit full{1, before.rlim_max};
    ::setrlimit(RLIMIT_FSIZE, &full);
  }
  ~FullDisk() { ::setrlimit(RLIMIT_FSIZE, &before); }
  rlimit before;
};

// Syncs that report what the disk did not take, while it lives.
struct BrokenDisk {
  BrokenDisk() { g_disk_is_broken = true; }
  ~BrokenDisk() { g_disk_is_broken = false; }
};

template <class Trouble>
class FailingStorage : public StateDirectory {};
using Troubles = testing::Types<FullDisk, BrokenDisk>;
TYPED_TEST_SUITE(FailingStorage, Troubles);

TYPED_TEST(FailingStorage, IsTheCallsResultAndTheObjectIsAsBefore) {
  const bool is_full = std::is_same_v<TypeParam, FullDisk>;
  const TEE_Result code = is_full ? TEE_ERROR_STORAGE_NO_SPACE : TEE_ERROR_STORAGE_NOT_AVAILABLE;
  const std::map<std::string, std::string> before = {{"a", "before"}, {"b", "B"}};
  auto device = std::make_unique<Device>(this->state);
  for (const auto &[id, data] : before) device->put_object({}, id, data);
  const uint32_t access = TEE_DATA_FLAG_ACCESS_READ | TEE_DATA_FLAG_ACCESS_WRITE;
  {
    const InsideTa ta(*device);
    TEE_ObjectHandle object, doomed, fresh;
    ASSERT_EQ(open_object("a", access, &object), TEE_SUCCESS);
    ASSERT_EQ(open_object("b", TEE_DATA_FLAG_ACCESS_WRITE_META, &doomed), TEE_SUCCESS);
    {
      const TypeParam trouble;
      EXPECT_EQ(TEE_WriteObjectData(object, "after, and longer", 17), code);
      EXPECT_EQ(create_object("new", "data", access, &fresh), code);
      EXPECT_EQ(fresh, nullptr);
      EXPECT_EQ(create_object("new", "", access, &fresh), TEE_SUCCESS);
      TEE_CloseObject(fresh);
      EXPECT_EQ(TEE_CloseAndDeletePersistentObject1(doomed), TEE_ERROR_STORAGE_NOT_AVAILABLE);
      EXPECT_EQ(open_object("new", access, &fresh), TEE_ERROR_ITEM_NOT_FOUND);
    }
    EXPECT_EQ(device->objects({}), before);
    EXPECT_EQ(read_on(object, 9), "before");
    EXPECT_EQ(TEE_WriteObjectData(object, "!", 1), TEE_SUCCESS);
    TEE_CloseObject(object);
  }
  device.reset();
  EXPECT_EQ(this->stored("a"), "before!");
}

}  // namespace
