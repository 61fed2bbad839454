#include "support/test_nginx.h"

#include <tavo/service_conf.h>

#include <algorithm>

#include "support/test_process.h"

namespace tavow3::test {

std::vector<std::string> DeclaredPorts() {
  std::vector<std::string> ports;
  TAVO_SERVICE_CONF* conf = nullptr;
  if (TAVOServiceConfGet("/usr/tavo/etc/services.d/tavow3.sc", &conf) != 0) return ports;
  for (int i = 0; i < conf->port_count; ++i) ports.emplace_back(conf->ports[i]);
  TAVOServiceConfFree(conf);
  return ports;
}

bool Declares(const std::string& port) {
  const std::vector<std::string> ports = DeclaredPorts();
  return std::find(ports.begin(), ports.end(), port) != ports.end();
}

void NginxRunning::SetUp() {
  const RunResult start = RunCommand({kNginxScript, "start"});
  ASSERT_EQ(0, start.status) << start.out << start.err;
}

void NginxRunning::TearDown() { (void)RunCommand({kNginxScript, "stop"}); }

}  // namespace tavow3::test
