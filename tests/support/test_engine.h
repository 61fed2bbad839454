// Engines whose registry holds only what a test puts in, and that registry
// read back as plain values.
#ifndef TAVOW3_TESTS_SUPPORT_TEST_ENGINE_H_
#define TAVOW3_TESTS_SUPPORT_TEST_ENGINE_H_

#include <tavow3/engine.h>
#include <tavow3/resource.h>

#include <string>
#include <utility>
#include <vector>

namespace tavow3::test {

// A new engine marked as loaded, so that no registration callback adds to
// what the test registers.
Engine LoadedEngine();

// Registers a resource with the given fields; fails the test when refused.
void Register(Engine& engine, unsigned short port, FQDNPortSchemaResource::Schema schema,
              const std::string& owner, const std::string& fqdn = "",
              const std::string& section = "", const std::string& title_key = "",
              const std::string& desc = "", const std::string& desc_key = "", int protocol = 0);

// The (host name, port) keys registered now, sorted.
std::vector<std::pair<std::string, unsigned short>> Keys(Engine& engine);

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_SUPPORT_TEST_ENGINE_H_
