// The custom domain's certificate, the staged save with its clean-up
// branches, and the restart.
#include <gtest/gtest.h>
#include <tavow3/zam.h>

#include <string>
#include <vector>

#include "support/fake_tools.h"
#include "support/syslog_capture.h"
#include "support/test_engine.h"
#include "support/test_files.h"
#include "support/test_mounts.h"
#include "support/test_process.h"
#include "zam/zam_fixtures.h"

namespace tavow3 {
namespace {

using Argvs = std::vector<std::vector<std::string>>;
using test::FakeCalls;
using test::HasLogMatching;
using test::LogMessages;
using test::ParseJson;
using test::PathExists;
using test::ReadBytes;
using test::SetFakeExit;
using test::WriteBytes;

constexpr char kCertificateDir[] = "/usr/tavo/etc/certificate/system/FQDN";
constexpr char kServiceFile[] = "/usr/tavo/share/certificate.d/system.cfg";
constexpr char kControlScript[] = "/usr/tavo/etc/rc.sysv/nginx.sh";

TEST(ZAMSave, ProcessCertificate) {
  struct Case {
    const char* name;
    const char* fqdn;
    bool certificate_dir;
    int tool_exit;
    bool ok;
    Argvs registered;
    Argvs unregistered;
    const char* log;  // expected error line, or null for none
  };
  const Argvs kSystemFQDN = {{"system", "FQDN"}};
  const Case cases[] = {
      {"domain registered", "admin.example", false, 0, true, kSystemFQDN, {}, nullptr},
      {"domain refused",
       "admin.example",
       false,
       3,
       false,
       kSystemFQDN,
       {},
       "zam:\\d+ Failed to register certificate for zam custom domain"},
      {"no domain, nothing registered", "", false, 0, true, {}, {}, nullptr},
      {"no domain, unregistered", "", true, 0, true, {}, kSystemFQDN, nullptr},
      {"no domain, unregistration refused",
       "",
       true,
       3,
       false,
       {},
       kSystemFQDN,
       "zam:\\d+ Failed to unregister certificate for zam custom domain"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    Engine engine = test::LoadedEngine();
    test::RemoveTree(kCertificateDir);
    test::RemoveTree(kServiceFile);
    if (c.certificate_dir) test::MustRun({"/bin/mkdir", "-p", kCertificateDir});
    for (const char* tool : {"tavocrtregister", "tavocrtunregister"}) {
      test::ClearFakeCalls(tool);
      SetFakeExit(tool, c.tool_exit);
    }
    test::ClearLog();
    ZAM zam(engine);
    ASSERT_EQ(0, zam.setFQDNEx(c.fqdn));
    EXPECT_EQ(c.ok, zam.ProcessCertificate());
    EXPECT_EQ(c.registered, FakeCalls("tavocrtregister"));
    EXPECT_EQ(c.unregistered, FakeCalls("tavocrtunregister"));
    if (!c.registered.empty()) {
      const Json::Value document = ParseJson(ReadBytes(kServiceFile));
      EXPECT_EQ("FQDN", document["services"][0]["service"].asString());
      EXPECT_EQ(c.fqdn, document["services"][0]["display_name"].asString());
      EXPECT_FALSE(document["services"][0].isMember("display_name_i18n"));
    }
    const std::vector<std::string> logs = LogMessages();
    EXPECT_EQ(c.log != nullptr,
              HasLogMatching(logs, "zam:\\d+ Failed to (un)?register certificate .*"));
    EXPECT_TRUE(c.log == nullptr || HasLogMatching(logs, c.log));
  }
}

class ZAMSaveTest : public testing::Test {
 protected:
  void SetUp() override {
    WriteBytes(test::kStored, kOldStored);
    // The generator must not have run when the save stops early.
    test::RemoveTree("/run/generator-ran");
  }

  static constexpr char kOldStored[] = R"({"port": 5000, "ssl": {"port": 5001}})";
};

TEST_F(ZAMSaveTest, CertificateFailureTouchesNoFile) {
  WriteBytes(test::kGenerator, "#!/bin/sh\ntouch /run/generator-ran\n", 0755);
  SetFakeExit("tavocrtregister", 1);
  Engine engine;
  ZAM zam(engine);
  ASSERT_EQ(0, zam.setFQDNEx("admin.example"));
  ASSERT_TRUE(zam.SetHttpsPort(PortValidator(6001)));
  EXPECT_FALSE(zam.Save());
  EXPECT_FALSE(zam.Set());
  EXPECT_EQ(kOldStored, ReadBytes(test::kStored));
  EXPECT_FALSE(PathExists(test::kStaging));
  EXPECT_FALSE(PathExists("/run/generator-ran"));
  EXPECT_TRUE(test::FakeCalls("tavofirewall").empty());
}

TEST_F(ZAMSaveTest, InstallsTheStagedFileAfterUpdate) {
  test::StandInGenerator(test::kValidConf);
  Engine engine;
  ZAM zam(engine);
  ASSERT_TRUE(zam.SetHttpsPort(PortValidator(6001)));
  ASSERT_TRUE(zam.setHSTS(true));
  ASSERT_TRUE(zam.Save());
  const Json::Value stored = ParseJson(ReadBytes(test::kStored));
  EXPECT_EQ(6001, stored["ssl"]["port"].asInt());
  EXPECT_EQ(5000, stored["port"].asInt());
  EXPECT_TRUE(stored["https"]["hsts"].asBool());
  EXPECT_EQ(1, stored["version"].asInt());
  EXPECT_FALSE(PathExists(test::kStaging));
  // The generated configuration stays for the deployment.
  EXPECT_EQ(test::kValidConf, ReadBytes(test::kTempConf));
  // The firewall file declares the new port and no longer the old one.
  const std::string firewall = ReadBytes(test::kFirewallFile);
  EXPECT_NE(std::string::npos, firewall.find("[zma_https]")) << firewall;
  EXPECT_NE(std::string::npos, firewall.find("ports=\"6001\"")) << firewall;
  EXPECT_EQ(std::string::npos, firewall.find("ports=\"5001\"")) << firewall;
}

// A failed save drops the staged, scratch and temporary files and keeps the
// stored one: when nginx rejects the configuration (no firewall file is made
// either), and when the stored file cannot be replaced. In this order: the
// read-only mount stays.
TEST_F(ZAMSaveTest, FailedSaveDropsTheStagedFiles) {
  struct Case {
    const char* name;
    const char* conf;
    bool read_only;           // the stored file's directory is read-only
    bool no_firewall_file;    // the failure comes before the firewall file is made
  };
  const Case cases[] = {
      {"rejected configuration", test::kInvalidConf, false, true},
      {"failed move", test::kValidConf, true, false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    test::StandInGenerator(c.conf);
    Engine engine;
    ZAM zam(engine);
    ASSERT_TRUE(zam.SetHttpsPort(PortValidator(6001)));
    if (c.read_only) {
      ASSERT_TRUE(test::BindReadOnly("/usr/tavo/etc/www"));
    }
    EXPECT_FALSE(zam.Save());
    EXPECT_EQ(kOldStored, ReadBytes(test::kStored));
    EXPECT_FALSE(PathExists(test::kStaging));
    EXPECT_FALSE(PathExists(test::kScratch));
    EXPECT_FALSE(PathExists(test::kTempConf));
    if (c.no_firewall_file) {
      EXPECT_FALSE(PathExists(test::kFirewallFile));
    }
  }
}

TEST_F(ZAMSaveTest, RestartReloadsThenNotifiesTheFirewall) {
  struct Case {
    const char* name;
    int reload_exit;
    bool ok;
    Argvs firewall;
  };
  const Case cases[] = {
      {"reloaded", 0, true, {{"--reload"}}},
      {"reload failed", 7, false, {}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    WriteBytes(kControlScript,
               "#!/bin/sh\necho \"$@\" >> /run/control-script.log\nexit " +
                   std::to_string(c.reload_exit) + "\n",
               0755);
    test::RemoveTree("/run/control-script.log");
    test::ClearFakeCalls("tavofirewall");
    Engine engine;
    ZAM zam(engine);
    EXPECT_EQ(c.ok, zam.RestartService());
    EXPECT_EQ("reload\n", ReadBytes("/run/control-script.log"));
    EXPECT_EQ(c.firewall, FakeCalls("tavofirewall"));
  }
}

}  // namespace
}  // namespace tavow3
