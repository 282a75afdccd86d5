// SPDX-License-Identifier: BSD-2-Clause
#include <sys/stat.h>

#include <algorithm>

#include "program.h"
#include "tsm/dsi.h"
#include "tsm/image.h"
#include "tsm_fake_device.h"

namespace tsm {
namespace {

class TsmProgram : public Program {
 protected:
  TsmProgram() : Program(OTRP_TSM_PROGRAM) {
    write("ca.pem", key_of(kCa).private_pem());
    write("device.json", device_info_json(test_device()).dump());
  }

  /// A home whose identity the fake device's responses are encrypted for.
  void settle() const {
    ASSERT_EQ(run("init --tsmid tsm1 --ca ca.pem").exit_code, 0);
    write("tsm/tsm-key.pem", test_tsm().key.private_pem());
  }
  bool exists(const std::string &name) const { return std::filesystem::exists(path(name)); }
};

TEST_F(TsmProgram, InitMakesAnIdentityOnceAndKeepsItsKeysPrivate) {
  ASSERT_EQ(run("init --tsmid tsm1 --ca ca.pem").exit_code, 0);
  for (const char *file : {"tsm/tsm-key.pem", "tsm/ca-tsm.pem"}) {
    struct stat info;
    ASSERT_EQ(stat(path(file).c_str(), &info), 0);
    EXPECT_EQ(info.st_mode & 0777u, 0600u) << file;
  }
  const std::string key = read("tsm/tsm-key.pem");
  EXPECT_EQ(run("init --ca ca.pem").exit_code, 2);
  EXPECT_EQ(read("tsm/tsm-key.pem"), key);
  EXPECT_EQ(run("--home other init").exit_code, 0) << "with the development CA";
}

TEST_F(TsmProgram, ResponsesAreShownKeptAndUsedForTheNextRequest) {
  settle();
  const std::string dsi_text = serialize_as_device(test_dsi());
  write("response.json", state_response(dsi_text));
  const Outcome shown = run("response response.json --device device.json --dsi-out dsi.json");
  EXPECT_EQ(shown.exit_code, 0) << shown.err;
  EXPECT_NE(shown.out.find("AIK " + key_of(kAik).fingerprint()), std::string::npos);
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

  EXPECT_EQ(run("image pack - -o app.img", "code").exit_code, 0);
  const std::string install =
      "request install-ta --device device.json --sd sd --ta-version 1 --ta "
      "00112233445566778899aabbccddeeff ";
  EXPECT_EQ(run(install + "--sp sp --image app.img").exit_code, 0);
  EXPECT_EQ(run(install + "--sp unknown --image app.img").exit_code, 2);
  const Outcome unpacked = run(install + "--sp sp --image ca.pem");
  EXPECT_EQ(unpacked.exit_code, 2);
  EXPECT_NE(unpacked.err.find("image pack"), std::string::npos);
  std::filesystem::remove(path("tsm/ca-tsm.pem"));
  EXPECT_EQ(run(install + "--sp sp --image app.img").exit_code, 2);
  const std::string create = "request create-sd --device device.json --sp sp --sd sd --sp-cert ";
  EXPECT_EQ(run(create + "\"$(printf '\\377')\"").exit_code, 2);
}

TEST_F(TsmProgram, RefusalsAndUnverifiedResponsesAreToldApart) {
  settle();
  write("refused.json", create_sd_response(refusal(0xDEAD0002)));
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
  EXPECT_FALSE(exists("dsi.json"));
  EXPECT_FALSE(exists("tsm/devices"));
}

TEST_F(TsmProgram, WrongInputGetsOneLineAndLeavesNoFile) {
  settle();
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
      sd + "$(printf '\\377')" + device,
      sd + std::string(57, 'x') + device,
      "request install-ta --sd sd --sp sp --ta short --ta-version 1 --image ca.pem" + device,
      "request delete-sd --sd sd --delete-ta maybe" + device,
      "response missing.json --device device.json",
      "image show ca.pem",
      "explain 0xdead0003",
      "image pack missing -o made.json",
      "--home nowhere request get-device-state" + device,
      "--home new init --tsmid 'a b' --ca ca.pem",
      "--home new init --ca device.json",
      "manage --state made.json get-device-state --home nowhere",
  };
  for (const std::string &arguments : kCases) {
    SCOPED_TRACE(arguments);
    const Outcome outcome = run(arguments);
    EXPECT_EQ(outcome.exit_code, 2);
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(outcome.err.substr(0, 10), "otrp-tsm: ");
    EXPECT_EQ(std::ranges::count(outcome.err, '\n'), 1) << outcome.err;
    for (const char *file : {"made.json", "new", "nowhere"}) EXPECT_FALSE(exists(file));
  }
}

TEST(Image, SaysWhetherItsDigestIsThatOfThePayload) {
  Bytes image = pack_image("payload");
  EXPECT_TRUE(parse_image(image)->digest_matches);
  EXPECT_FALSE(parse_image(image.substr(0, kImageHeaderLen - 1)));
  image.back() = '!';
  EXPECT_FALSE(parse_image(image)->digest_matches);
  image[16] = 48;  // the digest's length
  EXPECT_FALSE(parse_image(image));
}

}  // namespace
}  // namespace tsm
