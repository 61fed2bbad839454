// fw-status, fw-load and fw-unload: the firewall library's module sets.
#include <tavo/firewall.h>

#include <cstdio>
#include <string>

#include "commands.h"

namespace tavo_platform {

int FirewallStatus(const Args& args) {
  if (args.size() != 1) return UsageError("fw-status needs one module set");
  FW::TAVO_IPTABLES_MODULES modules;
  bool loaded = modules.isModuleLoad(args[0]);
  std::printf("%s: %s\n", args[0].c_str(), loaded ? "loaded" : "not loaded");
  return loaded ? kSuccess : kNo;
}

int FirewallLoad(const Args& args) {
  if (args.size() != 1) return UsageError("fw-load needs one module set");
  FW::TAVO_IPTABLES_MODULES modules;
  if (!modules.iptablesCoreModLoad(args[0])) {
    std::fprintf(stderr, "tavo-platform: cannot load module set %s\n", args[0].c_str());
    return kFailed;
  }
  std::printf("%s: loaded\n", args[0].c_str());
  return kSuccess;
}

int FirewallUnload(const Args& args) {
  if (args.size() != 1) return UsageError("fw-unload needs one module set");
  FW::TAVO_IPTABLES_MODULES modules;
  if (!modules.iptablesCoreModUnload(args[0])) {
    std::fprintf(stderr, "tavo-platform: cannot unload module set %s\n", args[0].c_str());
    return kFailed;
  }
  std::printf("%s: unloaded\n", args[0].c_str());
  return kSuccess;
}

}  // namespace tavo_platform
