// sc-read, port-conflict and service-status: firewall service files, port
// lists and service state.
#include <tavo/service_conf.h>
#include <tavo/tlib_service.h>

#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "commands.h"

namespace tavo_platform {
namespace {

// More conflicts than anyone reads in one line.
constexpr int kMaxConflicts = 64;

struct ConfFree {
  void operator()(TAVO_SERVICE_CONF* conf) const { TAVOServiceConfFree(conf); }
};
struct PortsFree {
  void operator()(TAVO_SERVICE_PORTS* ports) const { TAVOServiceConfPortsFree(ports); }
};

std::string Join(char** items, int count) {
  std::string joined;
  for (int i = 0; i < count; ++i) joined += (i ? "," : "") + std::string(items[i]);
  return joined;
}

// A value in double quotes, escaped as the file writes it, so the line reads
// back as the same value.
std::string Quoted(const char* value) {
  std::string quoted = "\"";
  for (const char* c = value; *c != '\0'; ++c) {
    if (*c == '"' || *c == '\\') quoted += '\\';
    quoted += *c;
  }
  return quoted + '"';
}

}  // namespace

int ServiceConfRead(const Args& args) {
  if (args.size() != 1) return UsageError("sc-read needs one file");
  TAVO_SERVICE_CONF* raw = nullptr;
  if (TAVOServiceConfGet(args[0].c_str(), &raw) != 0) return CallFailed("cannot read " + args[0]);
  std::unique_ptr<TAVO_SERVICE_CONF, ConfFree> conf(raw);
  for (int i = 0; i < conf->section_count; ++i) {
    const TAVO_SERVICE_SECTION& section = conf->sections[i];
    std::printf("[%s] ports=%s protocol=%s title=%s desc=%s\n", section.name,
                Join(section.ports, section.port_count).c_str(), section.protocol,
                Quoted(section.title).c_str(), Quoted(section.desc).c_str());
  }
  std::printf("%d sections, ports %s\n", conf->section_count,
              Join(conf->ports, conf->port_count).c_str());
  return kSuccess;
}

int PortConflict(const Args& args) {
  if (args.size() != 2 && args.size() != 3) {
    return UsageError("port-conflict needs CLAIMED CANDIDATES [tcp|udp]");
  }
  std::vector<char> claimed(args[0].begin(), args[0].end());
  std::vector<char> candidates(args[1].begin(), args[1].end());
  claimed.push_back('\0');
  candidates.push_back('\0');
  const char* proto = args.size() == 3 ? args[2].c_str() : "tcp";
  TAVO_SERVICE_PORTS* raw = nullptr;
  int result = TLIBIsPortConflict(claimed.data(), candidates.data(), proto, kMaxConflicts, &raw);
  if (result < 0) return CallFailed("cannot compare the port lists");
  std::unique_ptr<TAVO_SERVICE_PORTS, PortsFree> conflicts(raw);
  if (result == 0) {
    std::printf("no conflict\n");
    return kNo;
  }
  std::printf("conflict:");
  for (const TAVO_SERVICE_PORTS* port = conflicts.get(); port != nullptr; port = port->next) {
    std::printf(" %d", port->port);
  }
  std::printf("\n");
  return kSuccess;
}

int ServiceStatus(const Args& args) {
  if (args.size() != 1) return UsageError("service-status needs one service name");
  int pid = 0;
  int state = 0;
  if (TLIBServicectlStatus(args[0].c_str(), &pid, &state) != 0) {
    return CallFailed("cannot read the status of " + args[0]);
  }
  if (state == TLIB_SERVICE_RUNNING) {
    std::printf("%s: running (pid %d)\n", args[0].c_str(), pid);
    return kSuccess;
  }
  std::printf("%s: stopped\n", args[0].c_str());
  return kNo;
}

}  // namespace tavo_platform
