#include "zam/zam_test_util.h"

#define PCRE2_CODE_UNIT_WIDTH 8

#include <gtest/gtest.h>
#include <json/reader.h>
#include <pcre2.h>

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

namespace {

// The messages of `messages` that `pattern` (PCRE2) matches entirely.
std::vector<std::string> Matching(const std::vector<std::string>& messages,
                                  const std::string& pattern) {
  int error;
  PCRE2_SIZE offset;
  pcre2_code* re = pcre2_compile(reinterpret_cast<PCRE2_SPTR>(pattern.c_str()), pattern.size(),
                                 PCRE2_ANCHORED | PCRE2_ENDANCHORED, &error, &offset, nullptr);
  EXPECT_NE(nullptr, re) << "bad pattern " << pattern;
  std::vector<std::string> matching;
  if (re == nullptr) return matching;
  pcre2_match_data* match = pcre2_match_data_create_from_pattern(re, nullptr);
  for (const std::string& m : messages) {
    if (pcre2_match(re, reinterpret_cast<PCRE2_SPTR>(m.data()), m.size(), 0, 0, match, nullptr) >=
        0) {
      matching.push_back(m);
    }
  }
  pcre2_match_data_free(match);
  pcre2_code_free(re);
  return matching;
}

}  // namespace

bool HasLogMatching(const std::vector<std::string>& messages, const std::string& pattern) {
  return !Matching(messages, pattern).empty();
}

std::vector<std::string> LogsMatching(const std::string& pattern) {
  return Matching(LogMessages(), pattern);
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
