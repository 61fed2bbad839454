// What the management-interface tests share beyond tests/support: its file
// paths, a processor count of choice, the engine's registry as a comparable
// value, and a stand-in for the configuration generator.
#ifndef TAVOW3_TESTS_ZAM_ZAM_FIXTURES_H_
#define TAVOW3_TESTS_ZAM_ZAM_FIXTURES_H_

#include <tavow3/engine.h>
#include <tavow3/resource.h>

#include <map>
#include <string>
#include <tuple>
#include <utility>

namespace tavow3::test {

constexpr char kStored[] = "/usr/tavo/etc/www/ZAM.json";
constexpr char kFactory[] = "/usr/tavo/etc.defaults/www/ZAM.json";
constexpr char kStaging[] = "/var/tmp/nginx/ZAM.json";
constexpr char kScratch[] = "/var/tmp/nginx/ZAM.tmp";
constexpr char kTempConf[] = "/var/tmp/nginx/nginx.conf";
constexpr char kGenerator[] = "/usr/tavo/etc/rc.sysv/nginx-conf-generator.sh";
constexpr char kFirewallFile[] = "/usr/tavo/etc/services.d/tavow3.sc";

// Makes get_nprocs() report `count` processors: a bind mount over the
// kernel's list of online processors.
void FakeProcessorCount(int count);

// Every field of a registered port resource.
using ResourceFields = std::tuple<std::string, unsigned short, int, std::string, std::string,
                                  std::string, std::string, int, std::string>;

// The whole registry of an engine: its resources and its port-schema entries.
struct Registry {
  std::map<std::pair<std::string, unsigned short>, ResourceFields> resources;
  std::multimap<unsigned short, int> port_schemas;
  bool operator==(const Registry& other) const {
    return resources == other.resources && port_schemas == other.port_schemas;
  }
};
Registry Snapshot(Engine& engine);

// Replaces the configuration generator with a script that writes `conf` as
// the temporary nginx configuration and creates the scratch file ZAM.tmp.
void StandInGenerator(const std::string& conf);
// A configuration that nginx accepts and one that it refuses.
extern const char kValidConf[];
extern const char kInvalidConf[];

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_ZAM_ZAM_FIXTURES_H_
