// Helpers of the management-interface tests: files, mounts, the engine's
// registry as a comparable value, and stand-ins for the configuration
// generator and the web server's control script.
#ifndef TAVOW3_TESTS_ZAM_ZAM_TEST_UTIL_H_
#define TAVOW3_TESTS_ZAM_ZAM_TEST_UTIL_H_

#include <json/value.h>
#include <tavow3/engine.h>
#include <tavow3/resource.h>

#include <map>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

namespace tavow3::test {

constexpr char kStored[] = "/usr/tavo/etc/www/ZAM.json";
constexpr char kFactory[] = "/usr/tavo/etc.defaults/www/ZAM.json";
constexpr char kStaging[] = "/var/tmp/nginx/ZAM.json";
constexpr char kScratch[] = "/var/tmp/nginx/ZAM.tmp";
constexpr char kTempConf[] = "/var/tmp/nginx/nginx.conf";
constexpr char kGenerator[] = "/usr/tavo/etc/rc.sysv/nginx-conf-generator.sh";
constexpr char kFirewallFile[] = "/usr/tavo/etc/services.d/tavow3.sc";

// Writes `bytes` to `path` (test set-up only), creating its parents.
void WriteRaw(const std::string& path, const std::string& bytes);
// The file's bytes, or "<missing>".
std::string ReadRaw(const std::string& path);
// Runs argv and fails the test unless it exits 0.
void MustRun(const std::vector<std::string>& argv);
// Removes `path` when it exists.
void Remove(const std::string& path);
Json::Value ParseJson(const std::string& text);
// The messages matching `pattern` entirely.
std::vector<std::string> LogsMatching(const std::string& pattern);

// Makes get_nprocs() report `count` processors: a bind mount over the
// kernel's list of online processors.
void FakeProcessorCount(int count);
// Bind-mounts `dir` on itself read-only.
void BindReadOnly(const std::string& dir);

// Every field of a registered port resource.
using ResourceFields = std::tuple<std::string, unsigned short, int, std::string, std::string,
                                  std::string, std::string, int, std::string>;
ResourceFields Fields(const FQDNPortSchemaResource& resource);

// The whole registry of an engine: its resources and its port-schema entries.
struct Registry {
  std::map<std::pair<std::string, unsigned short>, ResourceFields> resources;
  std::multimap<unsigned short, int> port_schemas;
  bool operator==(const Registry& other) const {
    return resources == other.resources && port_schemas == other.port_schemas;
  }
};
Registry Snapshot(Engine& engine);
// The (host name, port) keys registered now.
std::vector<std::pair<std::string, unsigned short>> Keys(Engine& engine);

// A new engine marked as loaded: its registry holds only what the test puts in.
Engine LoadedEngine();

// Replaces the configuration generator with a script that writes `conf` as
// the temporary nginx configuration and creates the scratch file ZAM.tmp.
void StandInGenerator(const std::string& conf);
// A configuration that nginx accepts and one that it refuses.
extern const char kValidConf[];
extern const char kInvalidConf[];

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_ZAM_ZAM_TEST_UTIL_H_
