// The appliance's configuration generator serving the management interface
// from ZAM.json: what it renders, and that nginx accepts it.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/test_files.h"
#include "support/test_process.h"
#include "zam/zam_fixtures.h"

namespace tavow3 {
namespace {

using test::ReadBytes;
using test::RunCommand;
using test::WriteBytes;

constexpr char kGeneratorTool[] = "/usr/tavo/bin/tavonginxgen";

// The management servers' part of the generated configuration: from the
// first "server {" to the fragment includes.
std::string ManagementPart(const std::string& conf) {
  const size_t begin = conf.find("    server {");
  const size_t end = conf.find("include /etc/nginx/conf.d/*.conf;");
  if (begin == std::string::npos || end == std::string::npos) return "<no management servers>";
  return conf.substr(begin, end - begin);
}

TEST(ZAMGenerator, ServesTheSettingsFile) {
  test::FakeProcessorCount(4);
  struct Case {
    const char* name;
    const char* stored;  // null: none
    const char* staged;  // null: none
    std::vector<std::string> present;
    std::vector<std::string> absent;
  };
  const Case cases[] = {
      {"no file: the defaults",
       nullptr,
       nullptr,
       {"listen 5000 default_server;", "listen 5001 ssl default_server;", "gzip off;",
        "more_set_headers \"Server: nginx\";", "worker_connections 1024;",
        "ssl_certificate \"/usr/tavo/etc/ssl/default/server.crt\";"},
       {"return 301", "Strict-Transport-Security", "server_name", "set_real_ip_from", "http2"}},
      {"every setting",
       R"({"port": 6000, "ssl": {"port": 6001, "spdy": true, "redirect": true},
           "https": {"hsts": true, "compression": true}, "fqdn": "admin.example",
           "server_tag": "tavo-admin", "trust_proxy": ["10.0.0.0/8", "fe80::1"],
           "max_connections": 8192})",
       nullptr,
       {"listen 6000 default_server;", "listen 6001 ssl http2 default_server;",
        "return 301 https://$host:6001$request_uri;",
        "add_header Strict-Transport-Security \"max-age=31536000\" always;", "gzip on;",
        "server_name admin.example;", "more_set_headers \"Server: tavo-admin\";",
        "include /var/tmp/nginx/trusted_proxy/*.conf;\n        set_real_ip_from 10.0.0.0/8;\n"
        "        set_real_ip_from fe80::1;",
        "worker_connections 4096;"},
       {"gzip off;", "more_clear_headers"}},
      {"the staged file wins",
       R"({"port": 6000})",
       R"({"port": 7000})",
       {"listen 7000 default_server;"},
       {"listen 6000"}},
      {"limits clamp the connections",
       R"({"max_connections": 999999})",
       nullptr,
       {"worker_connections 65535;"},
       {}},
      {"no server header",
       R"({"server_tag": null})",
       nullptr,
       {"more_clear_headers Server;"},
       {"more_set_headers"}},
      {"texts nginx cannot take are left out",
       R"({"server_tag": "x\"; evil", "fqdn": "bücher.example",
           "trust_proxy": ["1.2.3.4; evil", "1.2.3.5"], "ssl": {"port": 70000}})",
       nullptr,
       {"more_clear_headers Server;", "set_real_ip_from 1.2.3.5;", "listen 5001 ssl"},
       {"evil", "server_name", "70000"}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    test::RemoveTree(test::kStored);
    test::RemoveTree(test::kStaging);
    if (c.stored != nullptr) WriteBytes(test::kStored, c.stored);
    if (c.staged != nullptr) WriteBytes(test::kStaging, c.staged);
    const test::RunResult generate = RunCommand({kGeneratorTool});
    ASSERT_EQ(0, generate.status) << generate.err;
    const std::string conf = ReadBytes(test::kTempConf);
    const std::string management = ManagementPart(conf);
    for (const std::string& text : c.present) {
      EXPECT_NE(std::string::npos, (text.rfind("worker", 0) == 0 ? conf : management).find(text))
          << text << "\n"
          << conf;
    }
    for (const std::string& text : c.absent) {
      EXPECT_EQ(std::string::npos, management.find(text)) << text << "\n" << management;
    }
    const test::RunResult check = RunCommand({"/usr/bin/nginx", "-tc", test::kTempConf});
    EXPECT_EQ(0, check.status) << check.err;
  }
}

}  // namespace
}  // namespace tavow3
