// Registry -> Firewall.json -> tavomustache with the appliance's template ->
// ".sc" file -> the platform's service-file reader.
#include <map>
#include <set>
#include <string>

#include <gtest/gtest.h>
#include <tavo/service_conf.h>

#include "support/test_engine.h"
#include "support/test_files.h"

namespace tavow3::test {
namespace {

using S = FQDNPortSchemaResource;

struct Section {
  std::string title, title_key, desc_key, desc, desc_extra, protocol;
  std::set<std::string> ports;
};

std::map<std::string, Section> ReadServiceFile(const std::string& path, std::set<int>* ports) {
  TAVO_SERVICE_CONF* conf = nullptr;
  EXPECT_EQ(0, TAVOServiceConfGet(path.c_str(), &conf)) << ReadBytes(path);
  std::map<std::string, Section> sections;
  if (conf == nullptr) return sections;
  for (int i = 0; i < conf->section_count; ++i) {
    const TAVO_SERVICE_SECTION& s = conf->sections[i];
    Section& section = sections[s.name];
    section = {s.title, s.title_key, s.desc_key, s.desc, s.desc_extra, s.protocol, {}};
    for (int p = 0; p < s.port_count; ++p) section.ports.insert(s.ports[p]);
  }
  for (int p = 0; p < conf->port_count; ++p) ports->insert(std::stoi(conf->ports[p]));
  TAVOServiceConfFree(conf);
  return sections;
}

TEST(FirewallRoundTrip, ServiceFileDeclaresTheRegisteredPorts) {
  Engine engine = LoadedEngine();
  const std::string quoted = "Say \"hi\" to C:\\web";
  Register(engine, 80, S::HTTP, "tavow3", "", "", "opt_http", "Web", "desc_http");
  Register(engine, 443, S::HTTPS, "tavow3", "a", "", "", quoted, "desc_https", 0);
  Register(engine, 443, S::HTTPS, "tavow3", "b", "", "", "Portal", "", 1);
  Register(engine, 8080, S::HTTP, "tavow3", "", "http_extra", "", "", "", 2);
  Register(engine, 9090, S::HTTP, "Pagora", "", "", "", "Pagora");
  ASSERT_EQ(1, engine.W3FwReGenAll());
  ASSERT_TRUE(engine.GenerateFirewallConfig("Pagora"));

  std::set<int> ports;
  std::map<std::string, Section> system =
      ReadServiceFile("/usr/tavo/etc/services.d/tavow3.sc", &ports);
  EXPECT_EQ((std::set<int>{80, 443, 8080}), ports);
  ASSERT_EQ(3u, system.size());
  const Section& http = system["ReverseProxy_80"];
  EXPECT_EQ((std::set<std::string>{"80"}), http.ports);
  EXPECT_EQ("HTTP", http.title);
  EXPECT_EQ("opt_http", http.title_key);
  EXPECT_EQ("desc_http", http.desc_key);
  EXPECT_EQ("Web", http.desc);
  EXPECT_EQ("tcp", http.protocol);
  const Section& https = system["ReverseProxy_443"];
  EXPECT_EQ((std::set<std::string>{"443"}), https.ports);
  EXPECT_EQ("HTTPS", https.title);
  EXPECT_EQ(quoted, https.desc) << "quotes and backslashes survive the template";
  EXPECT_EQ("Portal", https.desc_extra);
  EXPECT_EQ("udp,tcp", https.protocol);
  EXPECT_EQ((std::set<std::string>{"8080"}), system["http_extra"].ports);

  std::set<int> package_ports;
  std::map<std::string, Section> package =
      ReadServiceFile("/usr/local/etc/services.d/Pagora.sc", &package_ports);
  EXPECT_EQ((std::set<int>{9090}), package_ports);
  EXPECT_EQ("Pagora", package["VirtualHost_9090"].desc);
}

}  // namespace
}  // namespace tavow3::test
