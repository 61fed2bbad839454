#include "tavo/firewall.h"

#include <initializer_list>
#include <vector>

#include "spawn.h"

namespace FW {
namespace {

constexpr char kIptables[] = "/usr/bin/iptables";
constexpr char kZamDefaultSet[] = "ZAM_DEFAULT_SERVICE";
constexpr char kZamDefaultChain[] = "ZAM_DEFAULT_FORWARD";

// The chain of a known module set, or null.
const char* ChainOf(const std::string& name) {
  return name == kZamDefaultSet ? kZamDefaultChain : nullptr;
}

// Runs iptables on the filter table with `args`, silently, waiting for the
// xtables lock. Returns its exit status, -1 when it could not run.
int Iptables(std::initializer_list<const char*> args) {
  std::vector<const char*> argv = {kIptables, "-w", "-t", "filter"};
  argv.insert(argv.end(), args.begin(), args.end());
  argv.push_back(nullptr);
  tavo::internal::SpawnSpec spec;
  spec.argv = argv.data();
  spec.null_stdin = true;
  spec.null_stdout = true;
  spec.null_stderr = true;
  return tavo::internal::SpawnAndWait(spec);
}

// Result of asking iptables whether something exists.
enum class Probe { kYes, kNo, kFailed };

// `iptables -S chain` exits 1 when the chain does not exist.
Probe ChainExists(const char* chain) {
  int status = Iptables({"-S", chain});
  return status == 0 ? Probe::kYes : status == 1 ? Probe::kNo : Probe::kFailed;
}

// `iptables -C` exits 1 when the rule is missing and 2 when its target chain is.
Probe HookExists(const char* chain) {
  int status = Iptables({"-C", "INPUT", "-j", chain});
  return status == 0 ? Probe::kYes : status == 1 || status == 2 ? Probe::kNo : Probe::kFailed;
}

}  // namespace

bool TAVO_IPTABLES_MODULES::isModuleLoad(const std::string& name) {
  const char* chain = ChainOf(name);
  return chain != nullptr && ChainExists(chain) == Probe::kYes && HookExists(chain) == Probe::kYes;
}

bool TAVO_IPTABLES_MODULES::iptablesCoreModLoad(const std::string& name) {
  const char* chain = ChainOf(name);
  if (chain == nullptr) return false;
  Probe has_chain = ChainExists(chain);
  if (has_chain == Probe::kFailed || (has_chain == Probe::kNo && Iptables({"-N", chain}) != 0)) {
    return false;
  }
  Probe has_hook = HookExists(chain);
  // First in INPUT, so that the set's rules apply before any other rule.
  return has_hook == Probe::kYes ||
         (has_hook == Probe::kNo && Iptables({"-I", "INPUT", "1", "-j", chain}) == 0);
}

bool TAVO_IPTABLES_MODULES::iptablesCoreModUnload(const std::string& name) {
  const char* chain = ChainOf(name);
  if (chain == nullptr) return false;
  // A jump may have been added more than once; each one holds the chain.
  Probe has_hook;
  while ((has_hook = HookExists(chain)) == Probe::kYes) {
    if (Iptables({"-D", "INPUT", "-j", chain}) != 0) return false;
  }
  Probe has_chain = has_hook == Probe::kFailed ? Probe::kFailed : ChainExists(chain);
  if (has_chain != Probe::kYes) return has_chain == Probe::kNo;
  return Iptables({"-F", chain}) == 0 && Iptables({"-X", chain}) == 0;
}

}  // namespace FW
