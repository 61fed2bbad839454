// Registration and removal of host-name/port/schema records.
#include <tavow3/resource.h>

#include <netinet/in.h>
#include <sys/socket.h>

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include <tavow3/engine.h>

#include "engine/engine_private.h"
#include "sockets.h"
#include "support/syslog_capture.h"

namespace tavow3 {
namespace {

using Schema = FQDNPortSchemaResource::Schema;
constexpr Schema kHttp = FQDNPortSchemaResource::HTTP;
constexpr Schema kHttps = FQDNPortSchemaResource::HTTPS;
const char kSectionLog[] = "resource:224 Firewall section has wrong section name";

FQDNPortSchemaResource Record(const std::string& fqdn, unsigned short port, Schema schema,
                              const std::string& section = "") {
  return FQDNPortSchemaResource(fqdn, port, schema, section, "firewall:opt_" + fqdn, "Owner",
                                "firewall:desc", 2, "tavow3");
}

size_t SchemaEntries(Engine& engine, unsigned short port) {
  return engine.impl().port_schemas.count(port);
}

// An engine whose load cycle counts as run: it holds only what a test registers.
Engine EmptyEngine() {
  Engine engine;
  engine.impl().load_state = 2;
  return engine;
}

bool Holds(Engine& engine, const std::string& fqdn, unsigned short port) {
  return engine.impl().fqdn_resources.count(FQDNPortKey(fqdn, port)) != 0;
}

TEST(RegisterFQDNPortSchemaResource, ConflictRules) {
  struct Step {
    FQDNPortSchemaResource record;
    bool accepted;
  };
  struct Case {
    const char* what;
    std::vector<Step> steps;
    bool logs_section;
  };
  const Case cases[] = {
      {"same host name twice on a port",
       {{Record("", 80, kHttp), true}, {Record("", 80, kHttp), false}},
       false},
      {"two host names, one schema",
       {{Record("a.example", 443, kHttps), true}, {Record("b.example", 443, kHttps), true}},
       false},
      {"second schema on a port",
       {{Record("a.example", 8080, kHttp), true}, {Record("b.example", 8080, kHttps), false}},
       false},
      {"same name, other port",
       {{Record("a.example", 8080, kHttp), true}, {Record("a.example", 8081, kHttps), true}},
       false},
      {"reserved section prefix",
       {{Record("", 81, kHttp, "tavow3_http"), false}, {Record("", 81, kHttps), true}},
       true},
      {"section names near the prefix",
       {{Record("", 82, kHttp, "tavow3"), true},
        {Record("a", 82, kHttp, "Tavow3_x"), true},
        {Record("b", 82, kHttp, "my_tavow3_x"), true}},
       false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    test::ClearLog();
    Engine engine = EmptyEngine();
    size_t stored = 0;
    for (const Step& step : c.steps) {
      SCOPED_TRACE(step.record.fqdn + ":" + std::to_string(step.record.port));
      EXPECT_EQ(step.accepted, RegisterFQDNPortSchemaResource(engine, step.record));
      if (step.accepted) ++stored;
      EXPECT_EQ(stored, engine.impl().fqdn_resources.size());
      EXPECT_EQ(stored, engine.impl().port_schemas.size());
    }
    const std::vector<std::string> expected_log =
        c.logs_section ? std::vector<std::string>{kSectionLog} : std::vector<std::string>{};
    EXPECT_EQ(expected_log, test::LogMessages());
  }
}

TEST(RegisterFQDNPortSchemaResource, StoresACopyOfTheRecord) {
  Engine engine;
  FQDNPortSchemaResource record("portal.example", 5001, kHttps, "http_extra",
                                "firewall:firewall_service_opt_http_extra", "Pagora",
                                "firewall:firewall_service_desc_http", 1, "Pagora");
  ASSERT_TRUE(RegisterFQDNPortSchemaResource(engine, record));
  record.desc = "changed";
  const FQDNPortSchemaResource& stored =
      engine.impl().fqdn_resources.at(FQDNPortKey("portal.example", 5001));
  EXPECT_EQ("portal.example", stored.fqdn);
  EXPECT_EQ(5001, stored.port);
  EXPECT_EQ(kHttps, stored.schema);
  EXPECT_EQ("http_extra", stored.section);
  EXPECT_EQ("firewall:firewall_service_opt_http_extra", stored.title_key);
  EXPECT_EQ("Pagora", stored.desc);
  EXPECT_EQ("firewall:firewall_service_desc_http", stored.desc_key);
  EXPECT_EQ(1, stored.protocol);
  EXPECT_EQ("Pagora", stored.owner);
  const auto schema = engine.impl().port_schemas.find(5001);
  ASSERT_NE(engine.impl().port_schemas.end(), schema);
  EXPECT_EQ(kHttps, schema->second);
}

// The registry is loaded before the checks: a record that a load callback
// registered decides the schema of its port.
TEST(RegisterFQDNPortSchemaResource, LoadsBeforeChecking) {
  static int loads = 0;
  Engine::Register([](Engine& engine) {
    ++loads;
    EXPECT_TRUE(RegisterFQDNPortSchemaResource(engine, Record("", 9000, kHttp)));
  });
  Engine engine;
  EXPECT_FALSE(RegisterFQDNPortSchemaResource(engine, Record("other.example", 9000, kHttps)));
  EXPECT_EQ(1, loads);
  EXPECT_EQ(2u, engine.impl().load_state.load());
  EXPECT_TRUE(RegisterFQDNPortSchemaResource(engine, Record("other.example", 9000, kHttp)));
  EXPECT_EQ(1, loads);
  EXPECT_EQ(2u, SchemaEntries(engine, 9000));
}

// A port that another process uses is refused first: before the registry is
// loaded and before the section name is looked at.
TEST(RegisterFQDNPortSchemaResource, ForeignPortRefusedBeforeLoad) {
  static int loads = 0;
  Engine::Register([](Engine&) { ++loads; });
  test::BoundSocket foreign = test::Listen(AF_INET, 0);
  test::ClearLog();
  Engine engine;
  EXPECT_FALSE(RegisterFQDNPortSchemaResource(engine, Record("", foreign.port, kHttp)));
  EXPECT_FALSE(
      RegisterFQDNPortSchemaResource(engine, Record("", foreign.port, kHttp, "tavow3_x")));
  EXPECT_EQ(0, loads);
  EXPECT_EQ(0u, engine.impl().load_state.load());
  EXPECT_TRUE(engine.impl().fqdn_resources.empty());
  const std::string conflict =
      "engine:317 Runtime port " + std::to_string(foreign.port) + " conflict for nginx";
  EXPECT_EQ((std::vector<std::string>{conflict, conflict}), test::LogMessages());
  // Once the port is free it is taken.
  foreign.fd.Reset();
  EXPECT_TRUE(RegisterFQDNPortSchemaResource(engine, Record("", foreign.port, kHttp)));
  EXPECT_EQ(1, loads);
}

TEST(UnregisterFQDNPortSchemaResource, RemovesTheEntryAndOneSchema) {
  Engine engine = EmptyEngine();
  ASSERT_TRUE(RegisterFQDNPortSchemaResource(engine, Record("a", 443, kHttps)));
  ASSERT_TRUE(RegisterFQDNPortSchemaResource(engine, Record("b", 443, kHttps)));
  ASSERT_TRUE(RegisterFQDNPortSchemaResource(engine, Record("a", 80, kHttp)));
  ASSERT_EQ(2u, SchemaEntries(engine, 443));

  EXPECT_FALSE(UnregisterFQDNPortSchemaResource(engine, "c", 443));
  EXPECT_FALSE(UnregisterFQDNPortSchemaResource(engine, "a", 8443));
  EXPECT_EQ(2u, SchemaEntries(engine, 443));

  EXPECT_TRUE(UnregisterFQDNPortSchemaResource(engine, "a", 443));
  EXPECT_FALSE(Holds(engine, "a", 443));
  EXPECT_TRUE(Holds(engine, "b", 443));
  EXPECT_TRUE(Holds(engine, "a", 80));
  EXPECT_EQ(1u, SchemaEntries(engine, 443));
  EXPECT_FALSE(UnregisterFQDNPortSchemaResource(engine, "a", 443));
  EXPECT_EQ(1u, SchemaEntries(engine, 443));
  // The port keeps its schema while a record remains ...
  EXPECT_FALSE(RegisterFQDNPortSchemaResource(engine, Record("c", 443, kHttp)));
  // ... and is free for the other schema once the last one is gone.
  EXPECT_TRUE(UnregisterFQDNPortSchemaResource(engine, "b", 443));
  EXPECT_EQ(0u, SchemaEntries(engine, 443));
  EXPECT_TRUE(RegisterFQDNPortSchemaResource(engine, Record("c", 443, kHttp)));
  EXPECT_EQ(1u, SchemaEntries(engine, 80));
}

}  // namespace
}  // namespace tavow3
