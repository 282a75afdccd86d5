// SPDX-License-Identifier: BSD-2-Clause
// The program otrp-tsm as an operator meets it: exit codes, error lines, files left behind.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>

#include <cstdlib>
#include <filesystem>

#include "common/files.h"
#include "tsm/dsi.h"
#include "tsm/home.h"
#include "tsm/image.h"
#include "tsm_fake_device.h"

namespace tsm {
namespace {

namespace fs = std::filesystem;

struct Outcome {
  int exit_code;
  std::string out;
  std::string err;
};

class Cli : public testing::Test {
 protected:
  void SetUp() override {
    directory_ = fs::path(testing::TempDir()) / ("tsm_cli_" + std::to_string(getpid()));
    fs::remove_all(directory_);
    fs::create_directory(directory_);
    write("ca.pem", ca_key().private_pem());
    write("device.json", device_info_json(test_device()).dump());
  }
  void TearDown() override { fs::remove_all(directory_); }

  std::string path(const std::string &name) const { return (directory_ / name).string(); }
  void write(const std::string &name, const std::string &bytes) const {
    tools::write_file(path(name), bytes);
  }
  std::string read(const std::string &name) const { return tools::read_file(path(name)); }

  Outcome run(const std::string &arguments) const {
    const std::string command =
        "cd " + directory_.string() + " && " + OTRP_TSM_PROGRAM + " " + arguments + " > out 2> err";
    const int status = std::system(command.c_str());
    return {WEXITSTATUS(status), read("out"), read("err")};
  }

  /// A home whose identity the fake device's responses are encrypted for.
  void settle() const {
    ASSERT_EQ(run("init --tsmid tsm1 --ca ca.pem").exit_code, 0);
    tools::write_file(path("tsm/tsm-key.pem"), test_tsm().key.private_pem());
  }

 private:
  fs::path directory_;
};

TEST_F(Cli, InitMakesAnIdentityOnceAndKeepsItsKeysPrivate) {
  ASSERT_EQ(run("init --tsmid tsm1 --ca ca.pem").exit_code, 0);
  for (const char *file : {"tsm/tsm-key.pem", "tsm/ca-tsm.pem"}) {
    struct stat info;
    ASSERT_EQ(stat(path(file).c_str(), &info), 0);
    EXPECT_EQ(info.st_mode & 0777u, 0600u) << file;
  }
  const std::string key = read("tsm/tsm-key.pem");
  EXPECT_EQ(run("init --ca ca.pem").exit_code, 2);
  EXPECT_EQ(read("tsm/tsm-key.pem"), key);
  EXPECT_EQ(Home(path("tsm")).load_identity().tsmid, "tsm1");
  EXPECT_EQ(run("--home other init").exit_code, 0) << "with the development CA";
}

TEST_F(Cli, ResponsesAreShownKeptAndUsedForTheNextRequest) {
  settle();
  const std::string dsi_text = serialize_as_device(test_dsi());
  write("response.json", state_response(dsi_text));
  const Outcome shown = run("response response.json --device device.json --dsi-out dsi.json");
  EXPECT_EQ(shown.exit_code, 0) << shown.err;
  EXPECT_NE(shown.out.find("AIK " + aik_key().fingerprint()), std::string::npos);
  EXPECT_EQ(read("dsi.json"), dsi_text);
  EXPECT_NE(run("show").out.find("`-- TA ta"), std::string::npos);

  for (const char *source : {"", " --dsi dsi.json"}) {
    const Outcome request = run("request delete-sd --sd sd --delete-ta true --device device.json" +
                                std::string(source));
    ASSERT_EQ(request.exit_code, 0) << request.err;
    const Json envelope = parse_json(request.out)->at("DeleteSDRequest");
    const Bytes payload = base64url_decode(envelope.at("payload").get<std::string>()).value();
    EXPECT_EQ(parse_json(payload)->at("DeleteSDTBSRequest").at("dsihash"), dsi_hash(test_dsi()));
  }

  write("app.img", pack_image("code"));
  const std::string install =
      "request install-ta --device device.json --sd sd --sp sp --ta-version 1 --ta "
      "00112233445566778899aabbccddeeff --image ";
  EXPECT_EQ(run(install + "app.img").exit_code, 0);
  const Outcome unpacked = run(install + "ca.pem");
  EXPECT_EQ(unpacked.exit_code, 2);
  EXPECT_NE(unpacked.err.find("image pack"), std::string::npos);
}

TEST_F(Cli, RefusalsAndUnverifiedResponsesAreToldApart) {
  settle();
  write("refused.json",
        create_sd_response({{"reason", {{"error_code", 0xDEAD0002}}}, {"status", "fail"}}));
  const Outcome refused = run("response refused.json --device device.json --dsi-out dsi.json");
  EXPECT_EQ(refused.exit_code, 1);
  EXPECT_NE(refused.err.find("0xdead0002 (OTRP_SD_EXISTS)"), std::string::npos);

  std::string tampered = state_response(serialize_as_device(test_dsi()));
  tampered[60] = tampered[60] == 'A' ? 'B' : 'A';
  write("tampered.json", tampered);
  for (const char *flag : {"", " --json"}) {
    const Outcome outcome =
        run("response tampered.json --device device.json --dsi-out dsi.json" + std::string(flag));
    EXPECT_EQ(outcome.exit_code, 3);
    EXPECT_EQ(outcome.out, "");
  }
  EXPECT_FALSE(fs::exists(path("dsi.json")));
  EXPECT_FALSE(fs::exists(path("tsm/devices")));
}

TEST_F(Cli, WrongInputGetsOneLineAndLeavesNoFile) {
  settle();
  write("public.pem", read("device.json"));
  const std::string device = " --device device.json -o made.json";
  const std::string sd = "request create-sd --sp sp --sp-cert c --sd ";
  const std::string kCases[] = {
      "",
      "fly",
      "request",
      "request get-device-state -o made.json",
      "request get-device-state --device missing.json -o made.json",
      "request get-device-state --device ca.pem -o made.json",
      "request get-device-state --device device.json -o missing/made.json",
      "request get-device-state --rid 'a\"b'" + device,
      sd + "sd" + device,
      sd + "sd --dsi device.json" + device,
      sd + "''" + device,
      sd + "$(printf 's\\001')" + device,
      sd + std::string(57, 'x') + device,
      "request install-ta --sd sd --sp sp --ta short --ta-version 1 --image ca.pem" + device,
      "request delete-sd --sd sd --delete-ta maybe" + device,
      "response missing.json --device device.json",
      "image show ca.pem",
      "image pack missing -o made.json",
      "--home nowhere request get-device-state" + device,
      "--home new init --tsmid 'a b' --ca ca.pem",
      "--home new init --ca public.pem",
      "manage --state made.json get-device-state --home nowhere",
  };
  for (const std::string &arguments : kCases) {
    SCOPED_TRACE(arguments);
    const Outcome outcome = run(arguments);
    EXPECT_EQ(outcome.exit_code, 2);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err.substr(0, 10), "otrp-tsm: ");
    EXPECT_EQ(std::count(outcome.err.begin(), outcome.err.end(), '\n'), 1) << outcome.err;
    for (const char *file : {"made.json", "new", "nowhere"}) EXPECT_FALSE(fs::exists(path(file)));
  }
}

TEST_F(Cli, StandardStreamsStandForFiles) {
  EXPECT_EQ(run("image pack - -o - < ca.pem").out, pack_image(read("ca.pem")));
  const Outcome help = run("request create-sd --help");
  EXPECT_EQ(help.exit_code, 0);
  EXPECT_NE(help.out.find("Example: otrp-tsm request"), std::string::npos);
}

}  // namespace
}  // namespace tsm
