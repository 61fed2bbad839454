#include "zam/zam_test_util.h"

#include <gtest/gtest.h>
#include <json/reader.h>

#include <fstream>
#include <sstream>

#include "base/child_process.h"
#include "engine/engine_private.h"
#include "support/syslog_capture.h"

namespace tavow3::test {

const char kValidConf[] = "error_log /dev/null;\npid /run/nginx-standin.pid;\nevents {}\nhttp {}\n";
const char kInvalidConf[] = "this is not nginx\n";

void WriteRaw(const std::string& path, const std::string& bytes) {
  const size_t slash = path.rfind('/');
  if (slash != std::string::npos && slash > 0) MustRun({"/bin/mkdir", "-p", path.substr(0, slash)});
  std::ofstream out(path, std::ios::binary | std::ios::trunc);
  out << bytes;
  ASSERT_TRUE(out.good()) << path;
}

std::string ReadRaw(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) return "<missing>";
  std::ostringstream content;
  content << in.rdbuf();
  return content.str();
}

void MustRun(const std::vector<std::string>& argv) {
  ASSERT_EQ(0, base::Run(argv)) << argv[0] << (argv.size() > 1 ? " " + argv[1] : "");
}

void Remove(const std::string& path) { MustRun({"/bin/rm", "-rf", path}); }

Json::Value ParseJson(const std::string& text) {
  Json::Value value;
  if (!Json::Reader().parse(text, value, false)) return Json::Value();
  return value;
}

std::vector<std::string> LogsMatching(const std::string& pattern) {
  return LogsMatching(LogMessages(), pattern);
}

void FakeProcessorCount(int count) {
  const std::string list = count == 1 ? "0\n" : "0-" + std::to_string(count - 1) + "\n";
  WriteRaw("/run/fake-cpu-online", list);
  MustRun({"/bin/mount", "--bind", "/run/fake-cpu-online", "/sys/devices/system/cpu/online"});
}

void BindReadOnly(const std::string& dir) {
  MustRun({"/bin/mkdir", "-p", dir});
  MustRun({"/bin/mount", "--bind", dir, dir});
  MustRun({"/bin/mount", "-o", "remount,ro,bind", dir});
}

ResourceFields Fields(const FQDNPortSchemaResource& r) {
  return ResourceFields(r.fqdn, r.port, r.schema, r.section, r.title_key, r.desc, r.desc_key,
                        r.protocol, r.owner);
}

Registry Snapshot(Engine& engine) {
  Registry registry;
  for (const auto& [key, resource] : engine.impl().fqdn_resources) {
    registry.resources.emplace(key, Fields(resource));
  }
  for (const auto& [port, schema] : engine.impl().port_schemas) {
    registry.port_schemas.emplace(port, schema);
  }
  return registry;
}

std::vector<std::pair<std::string, unsigned short>> Keys(Engine& engine) {
  std::vector<std::pair<std::string, unsigned short>> keys;
  for (const auto& entry : Snapshot(engine).resources) keys.push_back(entry.first);
  return keys;
}

Engine LoadedEngine() {
  Engine engine;
  engine.impl().load_state = 2;
  return engine;
}

void StandInGenerator(const std::string& conf) {
  WriteRaw("/run/standin-nginx.conf", conf);
  WriteRaw(
      kGenerator,
      "#!/bin/sh\nmkdir -p /var/tmp/nginx\ncp /run/standin-nginx.conf /var/tmp/nginx/nginx.conf\n"
      "touch /var/tmp/nginx/ZAM.tmp\n");
  MustRun({"/bin/chmod", "755", kGenerator});
}

}  // namespace tavow3::test
