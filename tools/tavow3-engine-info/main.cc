// tavow3-engine-info [--try PORT[/http|/https][@HOST]]...
//
// Loads a fresh engine and prints its registry, the web server's process and
// ports, and the TCP ports that other processes hold, each with the processes
// that hold it: a registration on such a port is refused. Each --try then
// registers a sample record on the loaded engine and says whether, and why
// not, it was taken. Exit status 0, or 2 for a usage error.
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <map>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include <tavow3/engine.h>
#include <tavow3/resource.h>

#include "engine/engine_private.h"
#include "engine/runtime_port_scan.h"
#include "port_owners.h"

namespace {

using tavow3::Engine;
using tavow3::FQDNPortSchemaResource;
using tavow3::tools::PortSocket;

struct Attempt {
  unsigned short port = 0;
  FQDNPortSchemaResource::Schema schema = FQDNPortSchemaResource::HTTP;
  std::string host;  // "" any host name
};

const char* SchemaName(int schema) { return schema == 0 ? "HTTP" : "HTTPS"; }
std::string HostName(const std::string& host) { return host.empty() ? "(any)" : host; }

const char* ProtocolName(int protocol) {
  switch (protocol) {
    case 0:
      return "TCP";
    case 1:
      return "UDP";
    default:
      return "TCP+UDP";
  }
}

// "PORT[/http|/https][@HOST]"
bool ParseAttempt(const std::string& text, Attempt* attempt) {
  std::string rest = text;
  const size_t at = rest.find('@');
  if (at != std::string::npos) {
    attempt->host = rest.substr(at + 1);
    rest.resize(at);
  }
  const size_t slash = rest.find('/');
  if (slash != std::string::npos) {
    const std::string schema = rest.substr(slash + 1);
    if (schema == "https") {
      attempt->schema = FQDNPortSchemaResource::HTTPS;
    } else if (schema != "http") {
      return false;
    }
    rest.resize(slash);
  }
  char* end = nullptr;
  const long port = std::strtol(rest.c_str(), &end, 10);
  if (rest.empty() || *end != '\0' || port < 1 || port > 65535) return false;
  attempt->port = static_cast<unsigned short>(port);
  return true;
}

// "pid 12 (python3), pid 13 (python3)" without the web server, or "?".
std::string Holders(const std::vector<PortSocket>& sockets, pid_t web_server) {
  std::set<pid_t> pids;
  for (const PortSocket& socket : sockets) {
    for (pid_t pid : socket.holders) {
      if (pid != web_server) pids.insert(pid);
    }
  }
  if (pids.empty()) return "no visible process";
  std::string text;
  for (pid_t pid : pids) {
    if (!text.empty()) text += ", ";
    text += "pid " + std::to_string(pid) + " (" + tavow3::tools::ProcessName(pid) + ")";
  }
  return text;
}

void PrintRegistry(Engine& engine) {
  Engine::Private& d = engine.impl();
  std::printf("Engine: lock file /run/lock/tavow3.lock %s\n",
              d.lock_fd >= 0 ? "held shared" : "not held (descriptor -1)");
  std::vector<const FQDNPortSchemaResource*> records;
  for (const auto& entry : d.fqdn_resources) records.push_back(&entry.second);
  std::sort(records.begin(), records.end(), [](const auto* a, const auto* b) {
    return std::make_pair(a->port, a->fqdn) < std::make_pair(b->port, b->fqdn);
  });
  std::printf("Registry: %zu resource(s)\n", records.size());
  if (records.empty()) return;
  std::printf("  %-6s %-6s %-24s %-16s %-8s %-8s %s\n", "PORT", "SCHEMA", "HOST NAME", "SECTION",
              "OWNER", "PROTO", "DESCRIPTION");
  for (const FQDNPortSchemaResource* r : records) {
    std::printf("  %-6u %-6s %-24s %-16s %-8s %-8s %s\n", r->port, SchemaName(r->schema),
                HostName(r->fqdn).c_str(), r->section.empty() ? "(auto)" : r->section.c_str(),
                r->owner.c_str(), ProtocolName(r->protocol), r->desc.c_str());
  }
}

void PrintPorts(const std::map<unsigned short, std::vector<PortSocket>>& sockets,
                const std::vector<unsigned short>& foreign, int web_server) {
  if (web_server < 0) {
    std::printf("\nWeb server: no usable /run/nginx.pid, so every port in use counts\n");
  } else {
    std::printf("\nWeb server: pid %d (%s) from /run/nginx.pid\n", web_server,
                tavow3::tools::ProcessName(web_server).c_str());
  }
  std::printf("Ports held by other processes (registrations on them are refused): %zu\n",
              foreign.size());
  if (foreign.empty()) return;
  std::printf("  %-6s %-12s %-5s %s\n", "PORT", "STATE", "TABLE", "HELD BY");
  for (unsigned short port : foreign) {
    const auto found = sockets.find(port);
    if (found == sockets.end()) continue;  // gone since the scan
    for (const PortSocket& socket : found->second) {
      std::printf("  %-6u %-12s %-5s %s\n", port, tavow3::tools::StateName(socket.state),
                  socket.table.c_str(), Holders({socket}, web_server).c_str());
    }
  }
}

// Why the engine would refuse `attempt` now, or "" when nothing speaks against it.
std::string RefusalReason(Engine& engine, const Attempt& attempt,
                          const std::map<unsigned short, std::vector<PortSocket>>& sockets,
                          const std::vector<unsigned short>& foreign, int web_server) {
  if (std::binary_search(foreign.begin(), foreign.end(), attempt.port)) {
    return "in use by " + Holders(sockets.at(attempt.port), web_server);
  }
  Engine::Private& d = engine.impl();
  const auto schema = d.port_schemas.find(attempt.port);
  if (schema != d.port_schemas.end() && schema->second != attempt.schema) {
    return std::string("the port serves ") + SchemaName(schema->second);
  }
  if (d.fqdn_resources.count({attempt.host, attempt.port}) != 0) {
    return "this host name is registered on the port already";
  }
  return "";
}

void Try(Engine& engine, const Attempt& attempt) {
  const auto sockets = tavow3::tools::ReadPortSockets();
  const auto foreign = tavow3::CollectForeignTCPPorts();
  const int web_server = tavow3::ReadWebServerPid();
  const std::string reason = RefusalReason(engine, attempt, sockets, foreign, web_server);
  const bool taken = tavow3::RegisterFQDNPortSchemaResource(
      engine, FQDNPortSchemaResource(attempt.host, attempt.port, attempt.schema, "", "",
                                     "tavow3-engine-info", "", 0, "tavow3"));
  std::printf("  %u/%s host %s: %s", attempt.port, SchemaName(attempt.schema),
              HostName(attempt.host).c_str(), taken ? "registered" : "refused");
  if (!taken && !reason.empty()) std::printf(" (%s)", reason.c_str());
  std::printf("\n");
}

}  // namespace

int main(int argc, char** argv) {
  std::vector<Attempt> attempts;
  for (int i = 1; i < argc; ++i) {
    Attempt attempt;
    if (std::string(argv[i]) != "--try" || i + 1 == argc || !ParseAttempt(argv[++i], &attempt)) {
      std::fprintf(stderr, "usage: tavow3-engine-info [--try PORT[/http|/https][@HOST]]...\n");
      return 2;
    }
    attempts.push_back(attempt);
  }
  Engine engine;
  engine.load();
  PrintRegistry(engine);
  PrintPorts(tavow3::tools::ReadPortSockets(), tavow3::CollectForeignTCPPorts(),
             tavow3::ReadWebServerPid());
  if (!attempts.empty()) std::printf("\nRegistrations on this engine:\n");
  for (const Attempt& attempt : attempts) Try(engine, attempt);
  return 0;
}
