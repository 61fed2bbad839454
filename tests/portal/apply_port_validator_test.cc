// The port setters' rule: register the new port first, then drop the old one.
#include "portal/apply_port_validator.h"

#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "engine/engine_private.h"
#include "support/test_engine.h"
#include "support/test_process.h"

namespace tavow3 {
namespace {

using KeyList = std::vector<std::pair<std::string, unsigned short>>;
using Schema = FQDNPortSchemaResource::Schema;
using test::Keys;
using test::LoadedEngine;

FQDNPortSchemaResource PortalResource(const std::string& fqdn, Schema schema) {
  return FQDNPortSchemaResource(fqdn, /*port=*/1, schema, "photo_http", "app:title", "Photo",
                                "app:desc", /*protocol=*/0, "tavow3");
}

TEST(ApplyPortValidator, MovesTheRegistrationToTheNewPort) {
  Engine engine = LoadedEngine();
  unsigned short port = 0;
  ASSERT_EQ(PortChange::kChanged,
            ApplyPortValidator(engine, PortValidator(8080), PortalResource("", Schema::HTTP), &port));
  EXPECT_EQ(8080, port);
  EXPECT_EQ((KeyList{{"", 8080}}), Keys(engine));
  const FQDNPortSchemaResource& stored = engine.impl().fqdn_resources.begin()->second;
  EXPECT_EQ(8080, stored.port);
  EXPECT_EQ("photo_http", stored.section);
  EXPECT_EQ("tavow3", stored.owner);

  ASSERT_EQ(PortChange::kChanged,
            ApplyPortValidator(engine, PortValidator(8081), PortalResource("", Schema::HTTP), &port));
  EXPECT_EQ(8081, port);
  EXPECT_EQ((KeyList{{"", 8081}}), Keys(engine));
  EXPECT_EQ(0u, engine.impl().port_schemas.count(8080));
}

// The same port changes nothing; zero, a port with another schema and a port
// a process listens on are refused. Either way the old port stays registered.
TEST(ApplyPortValidator, UnchangedOrRefusedKeepsTheOldPort) {
  const struct {
    const char* name;
    std::function<void(Engine&)> setup;  // starts registered on 8080
    unsigned short port;
    PortChange change;
    KeyList keys;
  } cases[] = {
      {"same port", [](Engine&) {}, 8080, PortChange::kUnchanged, {{"", 8080}}},
      {"zero", [](Engine&) {}, 0, PortChange::kRefused, {{"", 8080}}},
      // Another service serves HTTPS on 9443: a port has one schema only.
      {"other schema",
       [](Engine& engine) {
         ASSERT_TRUE(RegisterFQDNPortSchemaResource(
             engine, FQDNPortSchemaResource("other.example", 9443, Schema::HTTPS, "", "", "", "",
                                            0, "tavow3")));
       },
       9443, PortChange::kRefused, {{"", 8080}, {"other.example", 9443}}},
      {"in use by a process", [](Engine&) {}, 9191, PortChange::kRefused, {{"", 8080}}},
  };
  const test::LoopbackListener listener(9191);
  ASSERT_TRUE(listener.listening());
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    Engine engine = LoadedEngine();
    unsigned short port = 0;
    ASSERT_EQ(PortChange::kChanged, ApplyPortValidator(engine, PortValidator(8080),
                                                       PortalResource("", Schema::HTTP), &port));
    c.setup(engine);
    EXPECT_EQ(c.change, ApplyPortValidator(engine, PortValidator(c.port),
                                           PortalResource("", Schema::HTTP), &port));
    EXPECT_EQ(8080, port);
    EXPECT_EQ(c.keys, Keys(engine));
  }
}

// The old resource is dropped under the resource's host name.
TEST(ApplyPortValidator, HostNamedResourceMovesToo) {
  Engine engine = LoadedEngine();
  unsigned short port = 0;
  const FQDNPortSchemaResource resource = PortalResource("photo.example", Schema::HTTPS);
  ASSERT_EQ(PortChange::kChanged, ApplyPortValidator(engine, PortValidator(8443), resource, &port));
  ASSERT_TRUE(RegisterFQDNPortSchemaResource(
      engine, FQDNPortSchemaResource("", 8443, Schema::HTTPS, "", "", "", "", 0, "tavow3")));
  ASSERT_EQ(PortChange::kChanged, ApplyPortValidator(engine, PortValidator(8444), resource, &port));
  EXPECT_EQ((KeyList{{"", 8443}, {"photo.example", 8444}}), Keys(engine));
}

}  // namespace
}  // namespace tavow3
