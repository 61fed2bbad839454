// Firewall strategies: the emergency rule of the Default mode and its removal.
#include <tavow3/nginx_fw_strategy.h>

#include <tavo/tlib_exec.h>

#include "base/log.h"

namespace {

constexpr char kLogTag[] = "nginx_deploy";
constexpr char kModuleSet[] = "ZAM_DEFAULT_SERVICE";
constexpr char kIptables[] = "/usr/bin/iptables";
constexpr char kFirewallTool[] = "/usr/tavo/bin/tavofirewall";
// Wait, no standard streams, no inherited descriptors, exit status as result.
constexpr unsigned int kIptablesExecFlags = 0xBB;

}  // namespace

NginxFwStrategy::~NginxFwStrategy() = default;

bool FwStrategyZAMDefault::ApplyFirewallStrategy() {
  if (isModuleLoad(kModuleSet)) return true;
  if (!iptablesCoreModLoad(kModuleSet)) {
    TAVOW3_LOG_ERR_AT(418, "Failed to load iptable core module");
    return false;
  }
  static const char* const kAcceptManagementPorts[] = {
      kIptables, "-A", "ZAM_DEFAULT_FORWARD", "-p", "tcp", "-m", "multiport",
      "--dport", "5000,5001", "-j", "ACCEPT", nullptr};
  if (TLIBCExecl(kAcceptManagementPorts, kIptablesExecFlags) != 0) {
    TAVOW3_LOG_ERR_AT(425, "Failed to set default iptable rules");
    return false;
  }
  return true;
}

bool FwStrategyClear::ApplyFirewallStrategy() {
  const bool reloaded = TLIBCExec(kFirewallTool, "--reload") == 0;
  if (!reloaded) TAVOW3_LOG_ERR_AT(398, "Failed to reload tavofirewall");
  bool flushed = true;
  if (isModuleLoad(kModuleSet)) {
    static const char* const kFlushChain[] = {kIptables, "-F", "ZAM_DEFAULT_FORWARD", nullptr};
    flushed = TLIBCExecl(kFlushChain, kIptablesExecFlags) == 0;
    if (!flushed) TAVOW3_LOG_ERR_AT(404, "Failed to clear iptable rules");
  }
  if (isModuleLoad(kModuleSet) && !iptablesCoreModUnload(kModuleSet)) {
    TAVOW3_LOG_ERR_AT(409, "Failed to unload iptable core module");
  }
  return reloaded && flushed;
}
