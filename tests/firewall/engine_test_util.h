// Helpers of the engine tests: files, mounts and an engine whose registry
// holds only what a test registers.
#ifndef TAVOW3_TESTS_FIREWALL_ENGINE_TEST_UTIL_H_
#define TAVOW3_TESTS_FIREWALL_ENGINE_TEST_UTIL_H_

#include <json/value.h>

#include <string>
#include <vector>

#include <tavow3/engine.h>
#include <tavow3/resource.h>

namespace tavow3::test {

// Whole content of `path`, or "<missing>" when it cannot be opened.
std::string ReadBytes(const std::string& path);
// Writes `bytes` to `path`, creating its parent directories.
void WriteBytes(const std::string& path, const std::string& bytes);
bool Exists(const std::string& path);
// Entry names of `dir`, sorted; empty when it is missing.
std::vector<std::string> Names(const std::string& dir);
// The JSON document in `path` (null when missing or malformed).
Json::Value ReadJson(const std::string& path);
Json::Value ParseJson(const std::string& text);

// Creates `dir` and bind-mounts it on itself read-only; false on failure.
bool BindReadOnly(const std::string& dir);

// A new engine marked as loaded, so that no registration callback adds to
// what the test registers.
Engine LoadedEngine();

// Registers a resource with the given fields; fails the test when refused.
void Register(Engine& engine, unsigned short port, FQDNPortSchemaResource::Schema schema,
              const std::string& owner, const std::string& fqdn = "",
              const std::string& section = "", const std::string& title_key = "",
              const std::string& desc = "", const std::string& desc_key = "", int protocol = 0);

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_FIREWALL_ENGINE_TEST_UTIL_H_
