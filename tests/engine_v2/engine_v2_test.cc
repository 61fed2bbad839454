// EngineV2: the load cycle shared with the carried Engine and the security data.
#include <set>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <tavow3/engine_v2.h>

#include "engine/engine_private.h"

namespace tavow3 {
namespace {

int runs = 0;
std::vector<const Engine::Private*> seen;

void Counting(Engine& engine) {
  ++runs;
  seen.push_back(&engine.impl());
}

TEST(EngineV2, SharesTheRunOnceStateOfTheCarriedEngine) {
  EngineV2::Register(Counting);

  Engine engine;
  engine.load();
  EngineV2 carrying(engine);
  carrying.load();
  EXPECT_EQ(1, runs) << "an Engine loaded first is not loaded again";

  EngineV2 v2;
  v2.load();
  Engine carried = v2.engine();
  carried.load();
  v2.W3FwReGenAll();
  EXPECT_EQ(2, runs) << "an EngineV2 loaded first is not loaded again";
  ASSERT_EQ(2u, seen.size());
  EXPECT_EQ(&engine.impl(), seen[0]);
  EXPECT_EQ(&v2.engine().impl(), seen[1]) << "added callbacks get the carried engine";
}

TEST(EngineV2, RegisteringLoadsFirstAndKeepsTheFirstRecord) {
  EngineV2::Register(Counting);
  EngineV2 v2;
  EngineV2 copy = v2;
  EXPECT_TRUE(RegisterCrtResource(copy, CrtResource("portal", "app", "First", "k1")));
  EXPECT_EQ(1, runs);
  EXPECT_FALSE(RegisterCrtResource(v2, CrtResource("portal", "app", "Second", "k2")));
  EXPECT_TRUE(RegisterCrtResource(v2, CrtResource("portal", "app2", "Other", "")));
  EXPECT_TRUE(RegisterCrtResource(v2, CrtResource("portal2", "app", "Other", "")));
  RegisterPackageSubscriber(copy, "portal2");
  RegisterPackageSubscriber(copy, "portal2");
  EXPECT_EQ(1, runs);

  const EngineV2::Security& security = v2.security();
  ASSERT_EQ(3u, security.crt_resources.size());
  const CrtResource& kept = security.crt_resources.at({"portal", "app"});
  EXPECT_EQ("First", kept.display_name);
  EXPECT_EQ("k1", kept.display_name_i18n);
  EXPECT_EQ(std::set<std::string>{"portal2"}, security.package_subscribers);

  EngineV2 other(v2.engine());
  EXPECT_TRUE(other.security().crt_resources.empty()) << "new security data for a new EngineV2";
}

}  // namespace
}  // namespace tavow3
