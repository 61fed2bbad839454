#include "zam/zam_fixtures.h"

#include "engine/engine_private.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::test {

const char kValidConf[] = "error_log /dev/null;\npid /run/nginx-standin.pid;\nevents {}\nhttp {}\n";
const char kInvalidConf[] = "this is not nginx\n";

void FakeProcessorCount(int count) {
  const std::string list = count == 1 ? "0\n" : "0-" + std::to_string(count - 1) + "\n";
  WriteBytes("/run/fake-cpu-online", list);
  MustRun({"/bin/mount", "--bind", "/run/fake-cpu-online", "/sys/devices/system/cpu/online"});
}

namespace {

ResourceFields Fields(const FQDNPortSchemaResource& r) {
  return ResourceFields(r.fqdn, r.port, r.schema, r.section, r.title_key, r.desc, r.desc_key,
                        r.protocol, r.owner);
}

}  // namespace

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

void StandInGenerator(const std::string& conf) {
  WriteBytes("/run/standin-nginx.conf", conf);
  WriteBytes(kGenerator,
             "#!/bin/sh\nmkdir -p /var/tmp/nginx\n"
             "cp /run/standin-nginx.conf /var/tmp/nginx/nginx.conf\ntouch /var/tmp/nginx/ZAM.tmp\n",
             0755);
}

}  // namespace tavow3::test
