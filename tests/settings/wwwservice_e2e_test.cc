// The general web service from its settings file to real nginx answering.
#include <gtest/gtest.h>

#include <algorithm>
#include <string>

#include <tavo/service_conf.h>
#include <tavow3/engine.h>
#include <tavow3/wwwservice.h>

#include "manager/manager_test_util.h"
#include "settings/settings_test_util.h"
#include "support/fake_tools.h"

namespace tavow3 {
namespace {

using test::Fetch;
using test::MustRun;
using test::ReadRaw;
using test::RunCommand;
using test::WriteRaw;

constexpr char kStored[] = "/usr/tavo/etc/www/WWWService.json";
constexpr char kServiceFile[] = "/usr/tavo/etc/services.d/tavow3.sc";

// nginx applies a reload after the signal: waits until `url` answers.
bool AnswersSoon(const std::string& url) {
  return test::WaitUntil([&] { return Fetch(url) != "<no answer>"; });
}

// The ports of every section of the installed firewall service file.
std::vector<std::string> DeclaredPorts() {
  std::vector<std::string> ports;
  TAVO_SERVICE_CONF* conf = nullptr;
  if (TAVOServiceConfGet(kServiceFile, &conf) != 0) return ports;
  for (int i = 0; i < conf->port_count; ++i) ports.emplace_back(conf->ports[i]);
  TAVOServiceConfFree(conf);
  return ports;
}

class WWWServiceEndToEnd : public testing::Test {
 protected:
  void SetUp() override {
    const test::RunResult start = RunCommand({test::kNginxScript, "start"});
    ASSERT_EQ(0, start.status) << start.out << start.err;
    ASSERT_NE("<no answer>", Fetch("http://127.0.0.1:5000/"));
  }
  void TearDown() override { (void)RunCommand({test::kNginxScript, "stop"}); }
};

TEST_F(WWWServiceEndToEnd, SavedAdditionalPortsAreServedAndDeclared) {
  ASSERT_EQ("<no answer>", Fetch("http://127.0.0.1:8081/"));
  WriteRaw(kStored,
           "{\"additionalPort\": {\"http\": 8081, \"https\": 8444}, "
           "\"ssl\": {\"hsts\": true, \"spdy\": true}}");
  test::ClearFakeCalls("tavofirewall");
  {
    Engine engine;
    WWWService www(engine);
    ASSERT_EQ(8081, www.GetHttpAddPort());
    EXPECT_TRUE(www.Set());
  }
  EXPECT_TRUE(AnswersSoon("http://127.0.0.1:8081/"));
  EXPECT_TRUE(AnswersSoon("https://127.0.0.1:8444/"));
  const test::RunResult https = RunCommand(
      {"/usr/bin/curl", "-sSk", "--http2", "-o", "/dev/null", "-D", "-", "--max-time", "5",
       "https://127.0.0.1:8444/"});
  EXPECT_EQ(0, https.status) << https.err;
  EXPECT_NE(std::string::npos, https.out.find("HTTP/2 200")) << https.out;
  EXPECT_NE(std::string::npos, https.out.find("strict-transport-security: max-age=31536000"))
      << https.out;
  const std::vector<std::string> declared = DeclaredPorts();
  EXPECT_NE(declared.end(), std::find(declared.begin(), declared.end(), "8081"));
  EXPECT_NE(declared.end(), std::find(declared.begin(), declared.end(), "8444"));
  EXPECT_FALSE(test::FakeCalls("tavofirewall").empty());
}

TEST_F(WWWServiceEndToEnd, ARejectedConfigurationChangesNothing) {
  const std::string stored = "{\"additionalPort\": {\"http\": 8081}}";
  WriteRaw(kStored, stored);
  {
    Engine engine;
    WWWService www(engine);
    ASSERT_TRUE(www.Set());
  }
  ASSERT_TRUE(AnswersSoon("http://127.0.0.1:8081/"));
  const std::string service_file = ReadRaw(kServiceFile);

  // A certificate that does not exist: nginx refuses the configuration.
  WriteRaw(kStored,
           "{\"additionalPort\": {\"http\": 8082, \"https\": 8445}, "
           "\"ssl\": {\"certificate\": \"/nowhere/server.crt\"}}");
  {
    Engine engine;
    WWWService www(engine);
    EXPECT_FALSE(www.Set());
  }
  EXPECT_NE("<no answer>", Fetch("http://127.0.0.1:8081/"));
  EXPECT_EQ("<no answer>", Fetch("http://127.0.0.1:8082/"));
  EXPECT_EQ(service_file, ReadRaw(kServiceFile));
}

}  // namespace
}  // namespace tavow3
