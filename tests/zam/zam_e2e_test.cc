// The typical request from end to end: a management tool moves the
// management interface's HTTPS port, and real nginx follows.
#include <gtest/gtest.h>
#include <tavow3/engine.h>
#include <tavow3/zam.h>

#include <algorithm>
#include <cctype>
#include <string>
#include <vector>

#include "support/fake_tools.h"
#include "support/test_files.h"
#include "support/test_nginx.h"
#include "support/test_process.h"
#include "zam/zam_fixtures.h"

namespace tavow3 {
namespace {

using test::Declares;
using test::Fetch;
using test::ReadBytes;
using test::RunCommand;
using test::WaitUntil;

constexpr char kNoAnswer[] = "<no answer>";
constexpr char kManagementPage[] = "Management interface";

// Response headers (lower case, as HTTP/2 sends them) of `url`, or "" without an answer.
std::string Headers(const std::string& url, const std::vector<std::string>& options = {}) {
  std::vector<std::string> argv = {"/usr/bin/curl", "-sSk", "-o", "/dev/null", "-D", "-",
                                   "--max-time",    "5"};
  argv.insert(argv.end(), options.begin(), options.end());
  argv.push_back(url);
  const test::RunResult run = RunCommand(argv);
  std::string headers = run.status == 0 ? run.out : "";
  std::transform(headers.begin(), headers.end(), headers.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  return headers;
}

bool HasHeaderSoon(const std::string& url, const std::string& text,
                   const std::vector<std::string>& options = {}) {
  return WaitUntil([&] { return Headers(url, options).find(text) != std::string::npos; });
}

class ZAMEndToEnd : public test::NginxRunning {
 protected:
  void SetUp() override {
    ASSERT_NO_FATAL_FAILURE(NginxRunning::SetUp());
    ASSERT_NE(std::string::npos, Fetch("https://127.0.0.1:5001/").find(kManagementPage));
    test::ClearFakeCalls("tavofirewall");
  }
};

TEST_F(ZAMEndToEnd, MovedHttpsPortIsServedDeclaredAndStored) {
  ASSERT_EQ(kNoAnswer, Fetch("https://127.0.0.1:6001/"));
  {
    Engine engine;
    ZAM zam(engine);
    ASSERT_TRUE(zam.SetHttpsPort(PortValidator(6001)));
    EXPECT_TRUE(zam.Set());
  }
  EXPECT_TRUE(WaitUntil(
      [] { return Fetch("https://127.0.0.1:6001/").find(kManagementPage) != std::string::npos; }));
  EXPECT_TRUE(WaitUntil([] { return Fetch("https://127.0.0.1:5001/") == kNoAnswer; }));
  EXPECT_NE(std::string::npos, Fetch("http://127.0.0.1:5000/").find(kManagementPage));

  EXPECT_TRUE(Declares("6001"));
  EXPECT_FALSE(Declares("5001"));
  const std::string firewall = ReadBytes(test::kFirewallFile);
  EXPECT_NE(std::string::npos, firewall.find("[zma_https]")) << firewall;
  const auto calls = test::FakeCalls("tavofirewall");
  ASSERT_FALSE(calls.empty());
  EXPECT_EQ(std::vector<std::string>{"--reload"}, calls.back());

  const Json::Value stored = test::ParseJson(ReadBytes(test::kStored));
  EXPECT_EQ(6001, stored["ssl"]["port"].asInt());
  EXPECT_FALSE(test::PathExists(test::kStaging));
}

TEST_F(ZAMEndToEnd, RejectedConfigurationChangesNothing) {
  {
    Engine engine;
    ZAM zam(engine);
    ASSERT_TRUE(zam.Set());
  }
  const std::string stored = ReadBytes(test::kStored);
  const std::string firewall = ReadBytes(test::kFirewallFile);
  ASSERT_NE("<missing>", firewall);
  // A fragment that nginx refuses: every configuration tested from now on fails.
  test::WriteBytes("/usr/local/etc/nginx/conf.d/broken.conf", "bogus_directive on;\n");
  test::ClearFakeCalls("tavofirewall");
  {
    Engine engine;
    ZAM zam(engine);
    ASSERT_TRUE(zam.SetHttpsPort(PortValidator(6002)));
    EXPECT_FALSE(zam.Set());
  }
  EXPECT_EQ(stored, ReadBytes(test::kStored));
  EXPECT_EQ(firewall, ReadBytes(test::kFirewallFile));
  EXPECT_FALSE(test::PathExists(test::kStaging));
  EXPECT_TRUE(test::FakeCalls("tavofirewall").empty());
  EXPECT_NE(std::string::npos, Fetch("https://127.0.0.1:5001/").find(kManagementPage));
  EXPECT_EQ(kNoAnswer, Fetch("https://127.0.0.1:6002/"));
}

TEST_F(ZAMEndToEnd, HttpsOptionsReachNginx) {
  test::FakeProcessorCount(4);
  {
    Engine engine;
    ZAM zam(engine);
    zam.SetEnableSPDY();
    zam.setHSTS(true);
    zam.SetEnableHttpsRedirect();
    zam.setHTTPCompression(true);
    zam.SetServerHeader(true, "tavo-admin");
    ASSERT_TRUE(zam.SetMaxConnections(8192));
    ASSERT_TRUE(zam.Set());
  }
  const std::string https = "https://127.0.0.1:5001/";
  EXPECT_TRUE(HasHeaderSoon(https, "server: tavo-admin", {"--http2"}));
  const std::string headers = Headers(https, {"--http2", "-H", "Accept-Encoding: gzip"});
  EXPECT_NE(std::string::npos, headers.find("http/2 200")) << headers;
  EXPECT_NE(std::string::npos, headers.find("strict-transport-security: max-age=31536000"))
      << headers;
  EXPECT_NE(std::string::npos, headers.find("content-encoding: gzip")) << headers;
  const std::string redirect = Headers("http://127.0.0.1:5000/some/page");
  EXPECT_NE(std::string::npos, redirect.find(" 301 ")) << redirect;
  EXPECT_NE(std::string::npos, redirect.find("location: https://127.0.0.1:5001/some/page"))
      << redirect;
  EXPECT_NE(std::string::npos, ReadBytes("/etc/nginx/nginx.conf").find("worker_connections 4096;"));

  {
    Engine engine;
    ZAM zam(engine);
    zam.SetServerHeader(false, "");
    zam.setHTTPCompression(false);
    ASSERT_TRUE(zam.Set());
  }
  EXPECT_TRUE(WaitUntil([&] {
    const std::string now = Headers(https, {"-H", "Accept-Encoding: gzip"});
    return !now.empty() && now.find("server:") == std::string::npos;
  }));
  EXPECT_EQ(std::string::npos,
            Headers(https, {"-H", "Accept-Encoding: gzip"}).find("content-encoding: gzip"));
}

}  // namespace
}  // namespace tavow3
