// Firewall library: named iptables module sets. A module set is a chain of
// the filter table and its jump, the first rule of INPUT; the only set plain
// Linux knows is "ZAM_DEFAULT_SERVICE", the chain "ZAM_DEFAULT_FORWARD". The
// iptables program is "/usr/bin/iptables". Not thread-safe against other
// writers of the same chain.
#ifndef TAVO_FIREWALL_H_
#define TAVO_FIREWALL_H_

#include <string>

namespace FW {

class TAVO_IPTABLES_MODULES {
 public:
  // Not virtual: the class has no virtual operation of its own, so a class
  // that derives from it lays its own virtual operations out first.
  TAVO_IPTABLES_MODULES() = default;
  ~TAVO_IPTABLES_MODULES() = default;

  // True when the set's chain exists and INPUT jumps to it.
  bool isModuleLoad(const std::string& name);
  // Creates the chain and the jump from INPUT, whichever is missing. True on
  // success; false for an unknown set or when iptables fails.
  bool iptablesCoreModLoad(const std::string& name);
  // Removes the jump and the chain (flushing it first). True on success,
  // also when nothing was loaded; false for an unknown set or when iptables fails.
  bool iptablesCoreModUnload(const std::string& name);
};

}  // namespace FW

#endif  // TAVO_FIREWALL_H_
