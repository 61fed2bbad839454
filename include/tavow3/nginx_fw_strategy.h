// Firewall strategies of the web server's configuration modes.
#ifndef TAVOW3_NGINX_FW_STRATEGY_H_
#define TAVOW3_NGINX_FW_STRATEGY_H_

#include <tavo/firewall.h>

#include <tavow3/export.h>

// What a configuration mode does to the firewall once it has been chosen.
// The emergency rule lives in the chain "ZAM_DEFAULT_FORWARD" of the module
// set "ZAM_DEFAULT_SERVICE". Not thread-safe against other writers of that chain.
class TAVOW3_EXPORT NginxFwStrategy : private FW::TAVO_IPTABLES_MODULES {
 public:
  // Applies the strategy; true on success, failures logged.
  [[nodiscard]] virtual bool ApplyFirewallStrategy() = 0;
  virtual ~NginxFwStrategy();

 protected:
  using FW::TAVO_IPTABLES_MODULES::iptablesCoreModLoad;
  using FW::TAVO_IPTABLES_MODULES::iptablesCoreModUnload;
  using FW::TAVO_IPTABLES_MODULES::isModuleLoad;
};

// Default mode: accepts TCP to the management ports 5000 and 5001 through the
// emergency chain. A loaded module set counts as the rule being in place, so
// applying twice adds the rule once.
class TAVOW3_EXPORT FwStrategyZAMDefault : public NginxFwStrategy {
 public:
  [[nodiscard]] bool ApplyFirewallStrategy() override;
};

// Normal and Abnormal modes: reloads the appliance's firewall, flushes the
// emergency chain and unloads its module set. True when the reload and the
// flush succeeded; every step runs even after an earlier one failed.
class TAVOW3_EXPORT FwStrategyClear : public NginxFwStrategy {
 public:
  [[nodiscard]] bool ApplyFirewallStrategy() override;
};

#endif  // TAVOW3_NGINX_FW_STRATEGY_H_
