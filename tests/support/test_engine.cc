#include "support/test_engine.h"

#include <algorithm>

#include <gtest/gtest.h>

#include "engine/engine_private.h"

namespace tavow3::test {

Engine LoadedEngine() {
  Engine engine;
  engine.impl().load_state = 2;
  return engine;
}

void Register(Engine& engine, unsigned short port, FQDNPortSchemaResource::Schema schema,
              const std::string& owner, const std::string& fqdn, const std::string& section,
              const std::string& title_key, const std::string& desc, const std::string& desc_key,
              int protocol) {
  const FQDNPortSchemaResource resource(fqdn, port, schema, section, title_key, desc, desc_key,
                                        protocol, owner);
  EXPECT_TRUE(RegisterFQDNPortSchemaResource(engine, resource))
      << "port " << port << " host \"" << fqdn << "\"";
}

std::vector<std::pair<std::string, unsigned short>> Keys(Engine& engine) {
  std::vector<std::pair<std::string, unsigned short>> keys;
  for (const auto& entry : engine.impl().fqdn_resources) keys.push_back(entry.first);
  std::sort(keys.begin(), keys.end());
  return keys;
}

}  // namespace tavow3::test
