// The port setters' rule: register the new port first, then drop the old one.
#include "portal/apply_port_validator.h"

#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <set>
#include <string>

#include "engine/engine_private.h"

namespace tavow3 {
namespace {

using Schema = FQDNPortSchemaResource::Schema;

FQDNPortSchemaResource PortalResource(const std::string& fqdn, Schema schema) {
  return FQDNPortSchemaResource(fqdn, /*port=*/1, schema, "photo_http", "app:title", "Photo",
                                "app:desc", /*protocol=*/0, "tavow3");
}

// An engine marked as loaded: no settings object's registration joins in, so
// the registry holds exactly what a test registers.
Engine LoadedEngine() {
  Engine engine;
  engine.impl().load_state = 2;
  return engine;
}

// The (host name, port) keys the engine holds now.
std::set<std::pair<std::string, unsigned short>> Registered(Engine& engine) {
  std::set<std::pair<std::string, unsigned short>> keys;
  for (const auto& [key, resource] : engine.impl().fqdn_resources) keys.insert(key);
  return keys;
}

TEST(ApplyPortValidator, MovesTheRegistrationToTheNewPort) {
  Engine engine = LoadedEngine();
  unsigned short port = 0;
  ASSERT_EQ(PortChange::kChanged,
            ApplyPortValidator(engine, PortValidator(8080), PortalResource("", Schema::HTTP), &port));
  EXPECT_EQ(8080, port);
  EXPECT_EQ((std::set<std::pair<std::string, unsigned short>>{{"", 8080}}), Registered(engine));
  const FQDNPortSchemaResource& stored = engine.impl().fqdn_resources.begin()->second;
  EXPECT_EQ(8080, stored.port);
  EXPECT_EQ("photo_http", stored.section);
  EXPECT_EQ("tavow3", stored.owner);

  ASSERT_EQ(PortChange::kChanged,
            ApplyPortValidator(engine, PortValidator(8081), PortalResource("", Schema::HTTP), &port));
  EXPECT_EQ(8081, port);
  EXPECT_EQ((std::set<std::pair<std::string, unsigned short>>{{"", 8081}}), Registered(engine));
  EXPECT_EQ(0u, engine.impl().port_schemas.count(8080));
}

TEST(ApplyPortValidator, SamePortAndZeroTouchNothing) {
  Engine engine = LoadedEngine();
  unsigned short port = 8080;
  EXPECT_EQ(PortChange::kUnchanged,
            ApplyPortValidator(engine, PortValidator(8080), PortalResource("", Schema::HTTP), &port));
  EXPECT_EQ(PortChange::kRefused,
            ApplyPortValidator(engine, PortValidator(0), PortalResource("", Schema::HTTP), &port));
  EXPECT_EQ(8080, port);
  EXPECT_TRUE(Registered(engine).empty());
}

TEST(ApplyPortValidator, RefusalKeepsTheOldPortRegistered) {
  Engine engine = LoadedEngine();
  unsigned short port = 0;
  ASSERT_EQ(PortChange::kChanged,
            ApplyPortValidator(engine, PortValidator(8080), PortalResource("", Schema::HTTP), &port));
  // Another service serves HTTPS on 9443: a port has one schema only.
  ASSERT_TRUE(RegisterFQDNPortSchemaResource(
      engine, FQDNPortSchemaResource("other.example", 9443, Schema::HTTPS, "", "", "", "", 0,
                                     "tavow3")));
  EXPECT_EQ(PortChange::kRefused,
            ApplyPortValidator(engine, PortValidator(9443), PortalResource("", Schema::HTTP), &port));
  EXPECT_EQ(8080, port);
  EXPECT_EQ((std::set<std::pair<std::string, unsigned short>>{{"", 8080}, {"other.example", 9443}}),
            Registered(engine));
}

TEST(ApplyPortValidator, PortInUseByAProcessIsRefused) {
  const int listener = ::socket(AF_INET, SOCK_STREAM, 0);
  ASSERT_GE(listener, 0);
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_port = htons(9191);
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  ASSERT_EQ(0, ::bind(listener, reinterpret_cast<sockaddr*>(&address), sizeof address));
  ASSERT_EQ(0, ::listen(listener, 1));

  Engine engine = LoadedEngine();
  unsigned short port = 8080;
  EXPECT_EQ(PortChange::kRefused,
            ApplyPortValidator(engine, PortValidator(9191), PortalResource("", Schema::HTTP), &port));
  EXPECT_EQ(8080, port);
  EXPECT_TRUE(Registered(engine).empty());
  ::close(listener);
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
  EXPECT_EQ((std::set<std::pair<std::string, unsigned short>>{{"", 8443}, {"photo.example", 8444}}),
            Registered(engine));
}

}  // namespace
}  // namespace tavow3
