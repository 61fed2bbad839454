// The general web service from its settings file to real nginx answering.
#include <gtest/gtest.h>

#include <string>

#include <tavow3/engine.h>
#include <tavow3/wwwservice.h>

#include "support/fake_tools.h"
#include "support/test_files.h"
#include "support/test_nginx.h"
#include "support/test_process.h"

namespace tavow3 {
namespace {

using test::Declares;
using test::Fetch;
using test::ReadBytes;
using test::RunCommand;
using test::WriteBytes;

constexpr char kStored[] = "/usr/tavo/etc/www/WWWService.json";
constexpr char kServiceFile[] = "/usr/tavo/etc/services.d/tavow3.sc";

// nginx applies a reload after the signal: waits until `url` answers.
bool AnswersSoon(const std::string& url) {
  return test::WaitUntil([&] { return Fetch(url) != "<no answer>"; });
}

class WWWServiceEndToEnd : public test::NginxRunning {
 protected:
  void SetUp() override {
    ASSERT_NO_FATAL_FAILURE(NginxRunning::SetUp());
    ASSERT_NE("<no answer>", Fetch("http://127.0.0.1:5000/"));
  }
};

TEST_F(WWWServiceEndToEnd, SavedAdditionalPortsAreServedAndDeclared) {
  ASSERT_EQ("<no answer>", Fetch("http://127.0.0.1:8081/"));
  WriteBytes(kStored,
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
  EXPECT_TRUE(Declares("8081"));
  EXPECT_TRUE(Declares("8444"));
  EXPECT_FALSE(test::FakeCalls("tavofirewall").empty());
}

TEST_F(WWWServiceEndToEnd, ARejectedConfigurationChangesNothing) {
  const std::string stored = "{\"additionalPort\": {\"http\": 8081}}";
  WriteBytes(kStored, stored);
  {
    Engine engine;
    WWWService www(engine);
    ASSERT_TRUE(www.Set());
  }
  ASSERT_TRUE(AnswersSoon("http://127.0.0.1:8081/"));
  const std::string service_file = ReadBytes(kServiceFile);

  // A certificate that does not exist: nginx refuses the configuration.
  WriteBytes(kStored,
           "{\"additionalPort\": {\"http\": 8082, \"https\": 8445}, "
           "\"ssl\": {\"certificate\": \"/nowhere/server.crt\"}}");
  {
    Engine engine;
    WWWService www(engine);
    EXPECT_FALSE(www.Set());
  }
  EXPECT_NE("<no answer>", Fetch("http://127.0.0.1:8081/"));
  EXPECT_EQ("<no answer>", Fetch("http://127.0.0.1:8082/"));
  EXPECT_EQ(service_file, ReadBytes(kServiceFile));
}

}  // namespace
}  // namespace tavow3
