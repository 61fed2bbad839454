// The appliance's generator and the web server's control script with the
// real nginx, curl and iptables.

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "manager_fixtures.h"
#include "support/test_files.h"
#include "support/test_nginx.h"
#include "support/test_process.h"

namespace tavow3::test {
namespace {

constexpr char kManagementPage[] = "Management interface";
constexpr char kWebPage[] = "General web service";
constexpr char kHttp[] = "http://127.0.0.1:5000/";
constexpr char kHttps[] = "https://127.0.0.1:5001/";
constexpr char kWeb[] = "http://127.0.0.1:80/";
constexpr char kBrokenFragment[] = "/usr/local/etc/nginx/conf.d/broken.conf";

bool Serves(const std::string& url, const std::string& page) {
  return Fetch(url).find(page) != std::string::npos;
}

RunResult Service(const std::string& verb) { return RunCommand({kNginxScript, verb}); }

TEST(NginxGenerator, WritesEveryFileAtomicallyAndNginxAcceptsThem) {
  const RunResult first = RunCommand({kGeneratorScript});
  ASSERT_EQ(0, first.status) << first.err;
  EXPECT_EQ(std::vector<std::string>{"tavow3.conf"}, DirNames("/usr/local/etc/nginx/conf.d"));
  EXPECT_EQ(std::vector<std::string>{"tavow3-www"},
            DirNames("/usr/local/etc/nginx/sites-enabled"));
  EXPECT_EQ((std::vector<std::string>{"app.d", "nginx.conf"}), DirNames("/var/tmp/nginx"));
  EXPECT_EQ(0644u, ModeOf(kTmpMainConf));
  EXPECT_EQ(0600u, ModeOf("/usr/tavo/etc/ssl/default/server.key"));
  EXPECT_EQ(0644u, ModeOf("/usr/tavo/etc/ssl/default/server.crt"));
  EXPECT_EQ((std::vector<std::string>{"server.crt", "server.key"}),
            DirNames("/usr/tavo/etc/ssl/default"));
  const std::string main_conf = ReadBytes(kTmpMainConf);
  for (const char* part : {"listen 5000 default_server;", "listen 5001 ssl default_server;",
                           "pid /run/nginx.pid;", "include /etc/nginx/conf.d/*.conf;",
                           "include /var/tmp/nginx/trusted_proxy/*.conf;"}) {
    EXPECT_NE(std::string::npos, main_conf.find(part)) << part;
  }

  // The trusted proxies set later are read through the include.
  ASSERT_EQ(0, RunCommand({kCli, "8", "192.0.2.1"}).status);
  const RunResult dump = RunCommand({"/usr/bin/nginx", "-T", "-c", kTmpMainConf});
  EXPECT_EQ(0, dump.status) << dump.err;
  EXPECT_NE(std::string::npos, dump.out.find("set_real_ip_from 192.0.2.1;")) << dump.out;

  // A second run keeps the certificate.
  const std::string certificate = ReadBytes("/usr/tavo/etc/ssl/default/server.crt");
  ASSERT_EQ(0, RunCommand({kGeneratorScript}).status);
  EXPECT_EQ(certificate, ReadBytes("/usr/tavo/etc/ssl/default/server.crt"));
}

TEST(NginxGenerator, WritesNothingWhenATemplateOrTheCertificateFails) {
  ASSERT_EQ(0, RunCommand({kGeneratorScript}).status);
  const std::string site = ReadBytes("/usr/local/etc/nginx/sites-enabled/tavow3-www");
  WriteBytes("/var/tmp/nginx/nginx.conf", "# kept\n");

  WriteBytes("/usr/tavo/share/nginx/tavow3-www.mustache", "{{#web_ports}} unclosed\n");
  RunResult run = RunCommand({kGeneratorScript});
  EXPECT_EQ(1, run.status);
  EXPECT_NE(std::string::npos, run.err.find("tavow3-www.mustache")) << run.err;
  EXPECT_EQ("# kept\n", ReadBytes(kTmpMainConf));
  EXPECT_EQ(site, ReadBytes("/usr/local/etc/nginx/sites-enabled/tavow3-www"));

  RemoveTree("/usr/tavo/etc/ssl/default");
  WriteBytes("/usr/tavo/etc/ssl/default", "not a directory");
  run = RunCommand({kGeneratorScript});
  EXPECT_EQ(1, run.status);
  EXPECT_NE(std::string::npos, run.err.find("/usr/tavo/etc/ssl/default")) << run.err;
  EXPECT_EQ("# kept\n", ReadBytes(kTmpMainConf));
  EXPECT_EQ(site, ReadBytes("/usr/local/etc/nginx/sites-enabled/tavow3-www"));

  EXPECT_EQ(2, RunCommand({kGeneratorScript, "--bogus"}).status);
}

TEST(NginxService, StartReloadStopWithTheRealServer) {
  RunResult run = Service("start");
  ASSERT_EQ(0, run.status) << run.out << run.err;
  EXPECT_EQ("Start Nginx Server in Normal Mode ......\n", run.out);
  EXPECT_TRUE(Serves(kHttp, kManagementPage));
  EXPECT_TRUE(Serves(kHttps, kManagementPage));
  EXPECT_TRUE(Serves(kWeb, kWebPage));
  EXPECT_EQ("0", ModeRecordText());
  EXPECT_FALSE(HasDefaultRule());
  run = Service("status");
  EXPECT_EQ(0, run.status);
  EXPECT_NE(std::string::npos, run.out.find("Nginx run in normal mode")) << run.out;
  EXPECT_EQ(0, Service("start").status);  // already running: nothing happens
  // From here on no start-up decision is made, and the flag keeps the
  // Abnormal alert's delayed process (which would outlive the test) away.
  WriteBytes(kForceDefaultFlag, "");

  // A broken fragment: the reload falls back to Abnormal, without the sites.
  WriteBytes(kBrokenFragment, "bogus_directive on;\n");
  run = Service("reload");
  EXPECT_EQ(0, run.status) << run.err;
  EXPECT_EQ("Start Nginx Server in Abnormal Mode ......\n", run.out);
  EXPECT_TRUE(WaitUntil([] { return Fetch(kWeb) == "<no answer>"; }));
  EXPECT_TRUE(Serves(kHttp, kManagementPage));
  EXPECT_TRUE(Serves(kHttps, kManagementPage));
  EXPECT_EQ("1", ModeRecordText());

  // Repaired: back to Normal on the next reload.
  RemoveTree(kBrokenFragment);
  run = Service("reload");
  EXPECT_EQ(0, run.status) << run.err;
  EXPECT_EQ("Start Nginx Server in Normal Mode ......\n", run.out);
  EXPECT_TRUE(WaitUntil([] { return Serves(kWeb, kWebPage); }));

  EXPECT_EQ(0, Service("stop").status);
  EXPECT_EQ("<no answer>", Fetch(kHttp));
  EXPECT_FALSE(PathExists("/run/nginx.pid"));
  EXPECT_EQ(3, Service("status").status);
  EXPECT_EQ(7, Service("reload").status);
  EXPECT_EQ(0, Service("stop").status);
  EXPECT_EQ(2, Service("restart").status);
}

TEST(NginxService, BootWithABrokenFragmentServesTheManagementPortsInDefault) {
  WriteBytes(kBrokenFragment, "bogus_directive on;\n");
  RunResult run = Service("start");
  ASSERT_EQ(0, run.status) << run.out << run.err;
  EXPECT_NE(std::string::npos,
            run.out.find("Failed to apply nginx normal mode, change to default mode\n"
                         "Start Nginx Server in Default Mode ......\n"))
      << run.out;
  EXPECT_TRUE(Serves(kHttp, kManagementPage));
  EXPECT_TRUE(Serves(kHttps, kManagementPage));
  EXPECT_EQ("<no answer>", Fetch(kWeb));
  EXPECT_TRUE(HasDefaultRule());
  EXPECT_EQ("2", ModeRecordText());

  // A reload stays in Default (the operator changes nothing) and nginx keeps
  // the management-only configuration.
  run = Service("reload");
  EXPECT_EQ(0, run.status);
  EXPECT_EQ("", run.out);
  EXPECT_EQ("2", ModeRecordText());
  EXPECT_TRUE(Serves(kHttp, kManagementPage));
  EXPECT_EQ(0, Service("stop").status);
}

TEST(NginxService, BootWithoutGenerationServesTheManagementPorts) {
  // The firewall files fail: nothing is generated and nothing installed, and
  // the installed configuration is the package's, not the appliance's.
  BreakFirewallFile();
  const RunResult run = Service("start");
  ASSERT_EQ(0, run.status) << run.out << run.err;
  EXPECT_EQ("Firewall is not ok, change to default mode\n"
            "Start Nginx Server in Default Mode ......\n",
            run.out);
  EXPECT_TRUE(Serves(kHttp, kManagementPage));
  EXPECT_TRUE(Serves(kHttps, kManagementPage));
  EXPECT_TRUE(HasDefaultRule());
  EXPECT_EQ(0, Service("stop").status);
}

}  // namespace
}  // namespace tavow3::test
