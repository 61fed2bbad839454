// tavo-platform COMMAND [ARG...]: one call of the appliance's platform API.
#include <cstdio>
#include <cstring>
#include <string>

#include "commands.h"

namespace {

struct Command {
  const char* name;
  const char* arguments;
  const char* what;
  int (*run)(const tavo_platform::Args&);
};

constexpr Command kCommands[] = {
    {"exec", "PROGRAM [ARG...]", "run PROGRAM (TLIBCExec, TLIBCExecl) and show its exit status",
     tavo_platform::Exec},
    {"popen", "PROGRAM [ARG...]", "run PROGRAM (TLIBCPopen) and show its output and errors",
     tavo_platform::Popen},
    {"fw-status", "SET", "whether the firewall module set is loaded", tavo_platform::FirewallStatus},
    {"fw-load", "SET", "load the firewall module set", tavo_platform::FirewallLoad},
    {"fw-unload", "SET", "unload the firewall module set", tavo_platform::FirewallUnload},
    {"tls-list", "", "the services of the TLS-profile store", tavo_platform::TlsList},
    {"tls-level", "SERVICE [LEVEL]", "show or set a service's TLS level (1-3)",
     tavo_platform::TlsLevel},
    {"sc-read", "FILE", "the sections of a firewall service file", tavo_platform::ServiceConfRead},
    {"port-conflict", "CLAIMED CANDIDATES [tcp|udp]",
     "candidate ports that lie in the claimed port list", tavo_platform::PortConflict},
    {"service-status", "NAME", "whether a service's pid file names a living process",
     tavo_platform::ServiceStatus},
};

void PrintUsage(FILE* out) {
  std::fprintf(out, "usage: tavo-platform COMMAND [ARG...]\n\ncommands:\n");
  for (const Command& command : kCommands) {
    std::string synopsis = std::string(command.name) + " " + command.arguments;
    std::fprintf(out, "  %-44s %s\n", synopsis.c_str(), command.what);
  }
  std::fprintf(out,
               "\nexit status: 0 success (or yes), 1 no (or the program run exited non-zero),\n"
               "2 bad arguments, 3 the platform call failed\n");
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 2) {
    PrintUsage(stderr);
    return 2;
  }
  if (std::strcmp(argv[1], "help") == 0 || std::strcmp(argv[1], "--help") == 0) {
    PrintUsage(stdout);
    return 0;
  }
  for (const Command& command : kCommands) {
    if (std::strcmp(argv[1], command.name) == 0) {
      return command.run(tavo_platform::Args(argv + 2, argv + argc));
    }
  }
  return tavo_platform::UsageError(std::string("unknown command \"") + argv[1] + "\"");
}
