// The port and custom-domain setters against the engine's registry, and the
// resources the management interface declares in the load cycle.
#include <gtest/gtest.h>
#include <tavow3/engine_v2.h>
#include <tavow3/zam.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "engine/engine_private.h"
#include "support/test_engine.h"
#include "support/test_files.h"
#include "support/test_process.h"
#include "zam/zam_fixtures.h"

namespace tavow3 {
namespace {

using Key = std::pair<std::string, unsigned short>;
using Keys = std::vector<Key>;
using Schema = FQDNPortSchemaResource::Schema;
using test::Snapshot;
using test::WriteBytes;

constexpr char kDomain[] = "admin.example";

// A resource of another service, registered before the setter runs.
FQDNPortSchemaResource Foreign(const std::string& fqdn, unsigned short port, Schema schema) {
  return FQDNPortSchemaResource(fqdn, port, schema, "other", "", "Other", "", 0, "tavow3");
}

TEST(ZAMPorts, LoadCycleDeclaresTheStoredPorts) {
  struct Case {
    const char* name;
    const char* stored;
    Keys keys;
  };
  const Case cases[] = {
      {"defaults", nullptr, {{"", 80}, {"", 443}, {"", 5000}, {"", 5001}}},
      {"stored ports",
       R"({"port": 6000, "ssl": {"port": 6001}})",
       {{"", 80}, {"", 443}, {"", 6000}, {"", 6001}}},
      {"custom domain",
       R"({"fqdn": "admin.example"})",
       {{"", 80},
        {"", 443},
        {"", 5000},
        {"", 5001},
        {kDomain, 80},
        {kDomain, 443},
        {kDomain, 5000},
        {kDomain, 5001}}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    test::RemoveTree(test::kStored);
    if (c.stored != nullptr) WriteBytes(test::kStored, c.stored);
    Engine engine;
    engine.load();
    EXPECT_EQ(c.keys, test::Keys(engine));
    EngineV2 v2;
    v2.load();
    EXPECT_EQ(c.keys, test::Keys(v2.engine()));
  }
}

TEST(ZAMPorts, ResourceRegisterDeclaresTheTableRows) {
  WriteBytes(test::kStored, R"({"port": 6000, "ssl": {"port": 6001}})");
  Engine engine = test::LoadedEngine();
  ZAM::ResourceRegister(engine);
  const std::vector<test::ResourceFields> expected = {
      {"", 80, Schema::HTTP, "http", "firewall:firewall_service_opt_http", "HTTP",
       "firewall:firewall_service_desc_http", 0, "tavow3"},
      {"", 443, Schema::HTTPS, "https", "firewall:firewall_service_opt_https", "HTTPS",
       "firewall:firewall_service_desc_http", 0, "tavow3"},
      {"", 6000, Schema::HTTP, "zma", "firewall:firewall_service_opt_zam_http", "ZAM",
       "firewall:firewall_service_desc_zam_http", 0, "tavow3"},
      {"", 6001, Schema::HTTPS, "zma_https", "firewall:firewall_service_opt_zam_https", "ZAM",
       "firewall:firewall_service_desc_zam_https", 0, "tavow3"},
  };
  std::vector<test::ResourceFields> registered;
  for (const auto& entry : Snapshot(engine).resources) registered.push_back(entry.second);
  EXPECT_EQ(expected, registered);

  WriteBytes(test::kStored, R"({"port": 6000, "ssl": {"port": 6001}, "fqdn": "admin.example"})");
  Engine with_domain = test::LoadedEngine();
  ZAM::ResourceRegister(with_domain);
  const test::Registry registry = Snapshot(with_domain);
  ASSERT_EQ(8u, registry.resources.size());
  for (const auto& [port, schema] : std::vector<std::pair<unsigned short, Schema>>{
           {80, Schema::HTTP}, {443, Schema::HTTPS}, {6000, Schema::HTTP}, {6001, Schema::HTTPS}}) {
    SCOPED_TRACE(port);
    ASSERT_EQ(1u, registry.resources.count({kDomain, port}));
    EXPECT_EQ(test::ResourceFields(kDomain, port, schema, "", "", "", "", 0, ""),
              registry.resources.at({kDomain, port}));
  }
}

TEST(ZAMPorts, ResourceRegisterV2DeclaresTheDomainCertificate) {
  struct Case {
    const char* stored;
    size_t resources;
    bool certificate;
  };
  const Case cases[] = {
      {"{}", 4, false},
      {R"({"fqdn": "admin.example"})", 8, true},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.stored);
    WriteBytes(test::kStored, c.stored);
    EngineV2 engine(test::LoadedEngine());
    ZAM::ResourceRegisterV2(engine);
    EXPECT_EQ(c.resources, engine.engine().impl().fqdn_resources.size());
    const auto& crts = engine.security().crt_resources;
    ASSERT_EQ(c.certificate ? 1u : 0u, crts.size());
    if (!c.certificate) continue;
    const CrtResource& crt = crts.begin()->second;
    EXPECT_EQ(EngineV2::CrtKey("system", "FQDN"), crts.begin()->first);
    EXPECT_EQ("system", crt.subscriber);
    EXPECT_EQ("FQDN", crt.service);
    EXPECT_EQ(kDomain, crt.display_name);
    EXPECT_EQ("", crt.display_name_i18n);
  }
}

TEST(ZAMPorts, SettersMoveTheRegistrations) {
  struct Case {
    const char* name;
    bool https;
    const char* stored;
    Keys expected;
  };
  const Case cases[] = {
      {"http", false, "{}", {{"", 80}, {"", 443}, {"", 5001}, {"", 6000}}},
      {"https", true, "{}", {{"", 80}, {"", 443}, {"", 5000}, {"", 6001}}},
      {"https with domain",
       true,
       R"({"fqdn": "admin.example"})",
       {{"", 80},
        {"", 443},
        {"", 5000},
        {"", 6001},
        {kDomain, 80},
        {kDomain, 443},
        {kDomain, 5000},
        {kDomain, 6001}}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    WriteBytes(test::kStored, c.stored);
    Engine engine;
    ZAM zam(engine);
    const unsigned short port = c.https ? 6001 : 6000;
    EXPECT_TRUE(c.https ? zam.SetHttpsPort(PortValidator(port))
                        : zam.SetHttpPort(PortValidator(port)));
    EXPECT_TRUE(zam.Dirty());
    EXPECT_EQ(c.expected, test::Keys(engine));
    EXPECT_EQ(port, c.https ? zam.GetHttpsPort() : zam.GetHttpPort());
    const test::ResourceFields own = Snapshot(engine).resources.at({"", port});
    EXPECT_EQ(c.https ? "zma_https" : "zma", std::get<3>(own));
    EXPECT_EQ(c.https ? "firewall:firewall_service_opt_zam_https"
                      : "firewall:firewall_service_opt_zam_http",
              std::get<4>(own));
    EXPECT_EQ(c.https ? "firewall:firewall_service_desc_zam_https"
                      : "firewall:firewall_service_desc_zam_http",
              std::get<6>(own));
    EXPECT_EQ("ZAM", std::get<5>(own));
    EXPECT_EQ("tavow3", std::get<8>(own));
    // The old port's schema entry went with its resource.
    EXPECT_EQ(0u, engine.impl().port_schemas.count(c.https ? 5001 : 5000));
  }
}

// A refused port, zero or the port already set leave the registry, the port and
// the dirty mark as they were.
TEST(ZAMPorts, RefusedOrSamePortChangesNothing) {
  struct Case {
    const char* name;
    const char* stored;
    bool https;
    unsigned short port;
    bool listen;                                 // a foreign process listens on the port
    std::vector<FQDNPortSchemaResource> others;  // registered by other services
    bool result = false;                         // the setter's result
  };
  const Case cases[] = {
      {"same port, http", "{}", false, 5000, false, {}, true},
      {"same port, https", "{}", true, 5001, false, {}, true},
      {"zero, http", "{}", false, 0, false, {}},
      {"zero, https", "{}", true, 0, false, {}},
      {"foreign listener, https", "{}", true, 6443, true, {}},
      {"foreign listener, http", "{}", false, 6080, true, {}},
      {"same key registered", "{}", false, 6080, false, {Foreign("", 6080, Schema::HTTP)}},
      {"other schema on the port",
       "{}",
       true,
       6443,
       false,
       {Foreign("portal.example", 6443, Schema::HTTP)}},
      {"standard port", "{}", true, 443, false, {}},
      {"the other own port", "{}", false, 5001, false, {}},
      // The any-host resource is taken, then the custom domain's is refused:
      // the first is rolled back.
      {"domain half done, https",
       R"({"fqdn": "admin.example"})",
       true,
       6443,
       false,
       {Foreign(kDomain, 6443, Schema::HTTPS)}},
      {"domain half done, http",
       R"({"fqdn": "admin.example"})",
       false,
       6080,
       false,
       {Foreign(kDomain, 6080, Schema::HTTP)}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    WriteBytes(test::kStored, c.stored);
    Engine engine;
    ZAM zam(engine);
    engine.load();
    for (const FQDNPortSchemaResource& other : c.others) {
      ASSERT_TRUE(RegisterFQDNPortSchemaResource(engine, other));
    }
    std::unique_ptr<test::LoopbackListener> listener;
    if (c.listen) {
      listener = std::make_unique<test::LoopbackListener>(c.port);
      ASSERT_TRUE(listener->listening());
    }
    const test::Registry before = Snapshot(engine);
    EXPECT_EQ(c.result, c.https ? zam.SetHttpsPort(PortValidator(c.port))
                                : zam.SetHttpPort(PortValidator(c.port)));
    EXPECT_TRUE(before == Snapshot(engine));
    EXPECT_FALSE(zam.Dirty());
    EXPECT_EQ(c.https ? 5001 : 5000, c.https ? zam.GetHttpsPort() : zam.GetHttpPort());
  }
}

TEST(ZAMPorts, DomainSetterCodes) {
  Engine engine;
  ZAM zam(engine);
  engine.load();
  const test::Registry plain = Snapshot(engine);
  {
    SCOPED_TRACE("invalid name");
    EXPECT_EQ(1, zam.setFQDNEx("bad_name!"));
    EXPECT_FALSE(zam.setFQDN("-a.b"));
    EXPECT_FALSE(zam.Dirty());
    EXPECT_TRUE(plain == Snapshot(engine));
  }
  {
    SCOPED_TRACE("first domain");
    EXPECT_EQ(0, zam.setFQDNEx(kDomain));
    EXPECT_TRUE(zam.Dirty());
    EXPECT_EQ(kDomain, zam.getFQDN());
    EXPECT_EQ((Keys{{"", 80},
                    {"", 443},
                    {"", 5000},
                    {"", 5001},
                    {kDomain, 80},
                    {kDomain, 443},
                    {kDomain, 5000},
                    {kDomain, 5001}}),
              test::Keys(engine));
    EXPECT_EQ(test::ResourceFields(kDomain, 5001, Schema::HTTPS, "", "", "", "", 0, ""),
              Snapshot(engine).resources.at({kDomain, 5001}));
  }
  {
    SCOPED_TRACE("unchanged");
    zam.SetDirty(false);
    EXPECT_EQ(0, zam.setFQDNEx(kDomain));
    EXPECT_FALSE(zam.Dirty());
  }
  {
    SCOPED_TRACE("moved to another domain, internationalised");
    EXPECT_TRUE(zam.setFQDN("bücher.example"));
    EXPECT_EQ((Keys{{"", 80},
                    {"", 443},
                    {"", 5000},
                    {"", 5001},
                    {"bücher.example", 80},
                    {"bücher.example", 443},
                    {"bücher.example", 5000},
                    {"bücher.example", 5001}}),
              test::Keys(engine));
  }
  {
    SCOPED_TRACE("cleared");
    EXPECT_EQ(0, zam.setFQDNEx(""));
    EXPECT_EQ("", zam.getFQDN());
    EXPECT_TRUE(plain == Snapshot(engine));
  }
}

TEST(ZAMPorts, RefusedDomainLeavesNoPartialRegistration) {
  // The n-th of the four registrations of the new domain is refused.
  const std::pair<unsigned short, Schema> taken[] = {
      {80, Schema::HTTP}, {443, Schema::HTTPS}, {5000, Schema::HTTP}, {5001, Schema::HTTPS}};
  for (const char* old_domain : {"", "old.example"}) {
    for (const auto& [port, schema] : taken) {
      SCOPED_TRACE(testing::Message() << "old '" << old_domain << "', port " << port);
      test::RemoveTree(test::kStored);
      Engine engine;
      ZAM zam(engine);
      ASSERT_EQ(0, zam.setFQDNEx(old_domain));
      ASSERT_TRUE(RegisterFQDNPortSchemaResource(engine, Foreign(kDomain, port, schema)));
      zam.SetDirty(false);
      const test::Registry before = Snapshot(engine);
      EXPECT_EQ(2, zam.setFQDNEx(kDomain));
      EXPECT_FALSE(zam.setFQDN(kDomain));
      EXPECT_TRUE(before == Snapshot(engine));
      EXPECT_EQ(old_domain, zam.getFQDN());
      EXPECT_FALSE(zam.Dirty());
    }
  }
}

}  // namespace
}  // namespace tavow3
