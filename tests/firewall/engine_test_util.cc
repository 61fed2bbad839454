#include "engine_test_util.h"

#include <sys/mount.h>
#include <sys/stat.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <sstream>

#include <gtest/gtest.h>
#include <json/reader.h>

#include "engine/engine_private.h"

namespace tavow3::test {

std::string ReadBytes(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) return "<missing>";
  std::ostringstream bytes;
  bytes << in.rdbuf();
  return bytes.str();
}

void WriteBytes(const std::string& path, const std::string& bytes) {
  std::filesystem::create_directories(std::filesystem::path(path).parent_path());
  std::ofstream out(path, std::ios::binary | std::ios::trunc);
  out << bytes;
  ASSERT_TRUE(out.good()) << path;
}

bool Exists(const std::string& path) {
  struct stat st;
  return ::lstat(path.c_str(), &st) == 0;
}

std::vector<std::string> Names(const std::string& dir) {
  std::vector<std::string> names;
  std::error_code error;
  for (const auto& entry : std::filesystem::directory_iterator(dir, error)) {
    names.push_back(entry.path().filename().string());
  }
  std::sort(names.begin(), names.end());
  return names;
}

Json::Value ParseJson(const std::string& text) {
  Json::Value value;
  Json::CharReaderBuilder builder;
  std::string errors;
  std::istringstream in(text);
  if (!Json::parseFromStream(builder, in, &value, &errors)) return Json::Value();
  return value;
}

Json::Value ReadJson(const std::string& path) { return ParseJson(ReadBytes(path)); }

bool BindReadOnly(const std::string& dir) {
  std::filesystem::create_directories(dir);
  return ::mount(dir.c_str(), dir.c_str(), nullptr, MS_BIND, nullptr) == 0 &&
         ::mount(nullptr, dir.c_str(), nullptr, MS_BIND | MS_REMOUNT | MS_RDONLY, nullptr) == 0;
}

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

}  // namespace tavow3::test
