// SPDX-License-Identifier: BSD-2-Clause
// State directories: who may use them, what a crash leaves, what happens to damaged ones.
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fstream>
#include <random>

#include "tee_support.h"

using namespace tee::test;

namespace fs = std::filesystem;

namespace {

class StateDirectory : public testing::Test {
 protected:
  std::string slurp(const fs::path &file) const {
    std::ifstream in(file, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), {}};
  }
  void spill(const fs::path &file, const std::string &bytes) const {
    std::ofstream(file, std::ios::binary) << bytes;
  }
  // A closed directory with some objects, one of them over many pages.
  void fill() const {
    Device device(state);
    for (int i = 0; i < 50; ++i) device.put_object({}, "id" + std::to_string(i), "small object");
    device.put_object({}, "large", std::string(100000, 'L'));
  }
  TempFolder folder;
  const fs::path state = folder.path / "a" / "b";
  const fs::path database = state / "objects.db";
};

TEST_F(StateDirectory, IsItsOwnersAlone) {
  const mode_t mask = ::umask(0);
  {
    const Device device(state);
    const InsideTa ta(const_cast<Device &>(device));
    EXPECT_EQ(write_object("id", "data"), TEE_SUCCESS);
    for (const char *file : {"..", "."}) {
      EXPECT_EQ(fs::status(state / file).permissions(), fs::perms::owner_all) << file;
    }
    for (const auto &file : fs::directory_iterator(state)) {
      EXPECT_EQ(file.status().permissions(), fs::perms::owner_read | fs::perms::owner_write)
          << file;
    }
  }
  ::umask(mask);
  // Folded into one file, a closed directory may be copied.
  EXPECT_FALSE(fs::exists(state / "objects.db-wal"));
  fs::rename(state, folder.path / "moved");
  EXPECT_EQ(Device(folder.path / "moved").objects({}).count("id"), 1u);
}

TEST_F(StateDirectory, IsSharedByContextsOfOneProcess) {
  fs::create_directories(state);
  spill(database, "");  // holds nothing: new
  Client first(state), second(state.string() + "/../b/");
  for (const std::string id : {"b", "\xff", "a", "ab"}) {
    EXPECT_EQ(tee_inspect_put(&first.context, &kTaA, id.data(), id.size(), "data", 4),
              TEEC_SUCCESS);
  }
  std::string ids;
  const auto visit = [](void *closure, const void *id, size_t id_len, size_t data_len) {
    auto &all = *static_cast<std::string *>(closure);
    all += std::string(static_cast<const char *>(id), id_len) + std::to_string(data_len) + ' ';
    return all.size() < 8;
  };
  EXPECT_EQ(tee_inspect_list(&second.context, &kTaA, visit, &ids), TEEC_SUCCESS);
  EXPECT_EQ(ids, "a4 ab4 b4 ");
  uint8_t *data;
  size_t data_len;
  ASSERT_EQ(tee_inspect_get(&second.context, &kTaA, "ab", 2, &data, &data_len), TEEC_SUCCESS);
  EXPECT_EQ(std::string(data, data + data_len), "data");
  std::free(data);
  EXPECT_EQ(tee_inspect_remove(&second.context, &kTaB, "ab", 2), TEEC_ERROR_ITEM_NOT_FOUND);
  EXPECT_EQ(tee_inspect_remove(&second.context, &kTaA, "ab", 2), TEEC_SUCCESS);
}

// ---- Several processes

// Runs `child` in a process of its own; its end is that process's.
template <class Child>
pid_t spawn(Child &&child) {
  const pid_t process = ::fork();
  if (process == 0) {
    child();
    ::_exit(0);
  }
  return process;
}

TEST_F(StateDirectory, ASecondProcessIsTurnedAway) {
  int ready[2];
  ASSERT_EQ(::pipe(ready), 0);
  const pid_t owner = spawn([&] {
    const Device device(state);
    [[maybe_unused]] const ssize_t written = ::write(ready[1], "!", 1);
    ::pause();
  });
  char byte;
  ASSERT_EQ(::read(ready[0], &byte, 1), 1);
  {
    const Client client(state);
    EXPECT_EQ(client.result, TEEC_ERROR_BUSY);
    EXPECT_EQ(client.context.imp, nullptr);
    EXPECT_STREQ(tee_inspect_last_error(),
                 ("state directory " + state.string() + " is in use by another process").c_str());
  }
  ::kill(owner, SIGKILL);
  ::waitpid(owner, nullptr, 0);
  const Client client(state);
  EXPECT_EQ(client.result, TEEC_SUCCESS);

  // Nor may a child go on with what its parent opened.
  const pid_t child = spawn([&] {
    const Client of_child(state);
    ::_exit(of_child.result == TEEC_ERROR_BUSY ? 7 : 8);
  });
  int status = 0;
  ::waitpid(child, &status, 0);
  EXPECT_EQ(WEXITSTATUS(status), 7);
  ::close(ready[0]);
  ::close(ready[1]);
}

// Saves the object "n", round after round, and tells each round that was closed.
void save_for_ever(const fs::path &state, int told) {
  Device device(state);
  const InsideTa ta(device);
  for (uint32_t n = 1;; ++n) {
    const std::string number = std::to_string(n);
    TEE_ObjectHandle object;
    if (open_object("n", TEE_DATA_FLAG_ACCESS_WRITE, &object) != TEE_SUCCESS) {
      write_object("n", std::string(number.size(), ' '));
      open_object("n", TEE_DATA_FLAG_ACCESS_WRITE, &object);
    }
    for (int part = 0; part < 200; ++part) {
      const std::string line = std::string(20 - number.size(), '0') + number;
      TEE_WriteObjectData(object, line.data(), 20);
    }
    TEE_CloseObject(object);
    if (::write(told, &n, sizeof(n)) < 0) return;
  }
}

TEST_F(StateDirectory, AProcessKilledAtAnyMomentLosesNothingThatWasClosed) {
  std::mt19937 random(1);
  for (int round = 0; round < 25; ++round) {
    SCOPED_TRACE(round);
    // Every third round meets the creation of the database.
    if (round % 3 == 0) fs::remove_all(state);
    int told[2];
    ASSERT_EQ(::pipe(told), 0);
    const pid_t child = spawn([&] { save_for_ever(state, told[1]); });
    ::close(told[1]);
    ::usleep(std::uniform_int_distribution<useconds_t>(0, round % 3 == 0 ? 8000 : 40000)(random));
    ::kill(child, SIGKILL);
    ::waitpid(child, nullptr, 0);
    uint32_t closed = 0;
    while (::read(told[0], &closed, sizeof(closed)) > 0) continue;
    ::close(told[0]);

    Device device(state);
    const std::string data = device.objects({})["n"];
    if (data.size() != 4000) {
      EXPECT_EQ(closed, 0u);
      EXPECT_TRUE(data.empty() || data == " ") << data;
      continue;
    }
    const std::string line = data.substr(0, 20);
    EXPECT_GE(std::stoul(line), closed);
    for (size_t at = 0; at < data.size(); at += 20) ASSERT_EQ(data.substr(at, 20), line);
  }
}

// ---- Damage

struct DamageCase {
  const char *name;
  void (*damage)(std::string &bytes);
};

const DamageCase kDamages[] = {
    {"NoDatabase", [](std::string &bytes) { bytes = "This is no database, but a text.\n"; }},
    {"Garbage", [](std::string &bytes) { bytes.assign(bytes.size(), '\xA5'); }},
    {"OneByte", [](std::string &bytes) { bytes.resize(1); }},
    {"Header", [](std::string &bytes) { bytes.resize(100); }},
    {"FirstPage", [](std::string &bytes) { bytes.resize(4096); }},
    {"LastPageMissing", [](std::string &bytes) { bytes.resize(bytes.size() - 4096); }},
    {"HalfAPageMissing", [](std::string &bytes) { bytes.resize(bytes.size() - 2048); }},
    {"ForeignApplication", [](std::string &bytes) { bytes[68] ^= 1; }},
    {"OtherVersion", [](std::string &bytes) { bytes[63] ^= 2; }},
    {"OtherSchema", [](std::string &bytes) { bytes[bytes.find("digest BLOB")] = 'D'; }},
    {"PageOverwritten", [](std::string &bytes) { bytes.replace(4096, 4096, 4096, '\0'); }},
    {"ByteInsideAnObject", [](std::string &bytes) { bytes[bytes.rfind("LLLL")] ^= 1; }},
    {"ByteInsideAnId", [](std::string &bytes) { bytes[bytes.find("id49") + 1] ^= 1; }},
};

TEST_F(StateDirectory, DamageIsReportedAndTheFileLeftAsItIs) {
  fill();
  const std::string sound = slurp(database);
  for (const DamageCase &c : kDamages) {
    SCOPED_TRACE(c.name);
    std::string bytes = sound;
    c.damage(bytes);
    spill(database, bytes);
    const Client client(state);
    EXPECT_EQ(client.result, TEEC_ERROR_CORRUPT_OBJECT);
    EXPECT_NE(std::string(tee_inspect_last_error()).find("objects.db is damaged"),
              std::string::npos);
    EXPECT_TRUE(slurp(database) == bytes);
    EXPECT_FALSE(fs::exists(state / "objects.db-wal"));
  }
}

TEST_F(StateDirectory, ALogLeftBehindIsRecoveredAndKeptBesideADamagedDatabase) {
  fill();
  ::waitpid(spawn([&] { (new Device(state))->put_object({}, "id1", "in the log"); }), nullptr, 0);
  const std::string sound = slurp(database), log = slurp(state / "objects.db-wal");
  std::string changed = sound;
  changed[changed.rfind("LLLL")] ^= 1;
  for (const std::string &damaged : {changed, std::string()}) {
    spill(database, damaged);
    EXPECT_EQ(Client(state).result, TEEC_ERROR_CORRUPT_OBJECT);
    EXPECT_TRUE(slurp(database) == damaged);
    EXPECT_TRUE(slurp(state / "objects.db-wal") == log);
  }
  spill(database, sound);
  EXPECT_EQ(Device(state).objects({})["id1"], "in the log");
}

TEST_F(StateDirectory, WhatCannotBeUsedIsRefused) {
  spill(folder.path / "file", "");
  EXPECT_EQ(Client(folder.path / "file").result, TEEC_ERROR_BAD_PARAMETERS);
  EXPECT_EQ(Client(folder.path / "file" / "state").result, TEEC_ERROR_BAD_PARAMETERS);
  EXPECT_EQ(Client("").result, TEEC_ERROR_BAD_PARAMETERS);
  fs::create_directories(database);
  EXPECT_EQ(Client(state).result, TEEC_ERROR_CORRUPT_OBJECT);
  fs::remove(database);
  if (::geteuid() == 0) GTEST_SKIP() << "root may read everything";
  fill();
  fs::permissions(database, fs::perms::none);
  EXPECT_EQ(Client(state).result, TEEC_ERROR_ACCESS_DENIED);
}

// The handle's writes went well, and the disk is full when they are to be stored.
TEST_F(StateDirectory, AnObjectThatCannotBeStoredAfterAllPanics) {
  const auto save_in_vain = [&] {
    Device device(state);
    const InsideTa ta(device);
    const rlimit limit{64 * 1024, 64 * 1024};
    ::signal(SIGXFSZ, SIG_IGN);
    ::setrlimit(RLIMIT_FSIZE, &limit);
    write_object("id", std::string(200000, 'x'));
  };
  EXPECT_DEATH(save_in_vain(), "TEE panic: TA .*: TEE_CloseObject: .*objects.db");
  EXPECT_TRUE(Device(state).objects({}).empty());
}

}  // namespace
