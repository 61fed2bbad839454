// Checks that the settings objects run on user input before they accept it.
#ifndef TAVOW3_VALIDATOR_H_
#define TAVOW3_VALIDATOR_H_

#include <set>
#include <string>

#include <tavow3/export.h>

namespace tavow3 {

// Stateless checks: host names, address ranges and the ports that the
// firewall service files already claim. Every function may be called from any
// thread; the patterns are compiled once, on first use.
class TAVOW3_EXPORT Validator {
 public:
  // True when none of `ports` lies in a port list of
  // "/usr/tavo/etc/services.d/tavow3.sc" or "/usr/local/etc/services.d/Pagora.sc"
  // (missing or unreadable files claim nothing). Logs one error line per
  // colliding port; `ports` is not modified.
  [[nodiscard]] static bool CheckSCConflict(std::set<unsigned short>& ports);
  // CheckSCConflict of the set holding `port` alone.
  [[nodiscard]] static bool CheckSCConflict(unsigned short port);

  // True for 1 to 15 bytes that are neither white space nor one of
  // `=~!@#$%^&*()_+[]\{}|;:'",/<>?. (bytes of 0x80 and above are allowed).
  [[nodiscard]] static bool IsNetBIOSName(const std::string& name);

  // True for an IPv4 address (decimal octets without leading zeros) with an
  // optional "/0" to "/32", or an IPv6 address in any textual form without a
  // zone, with an optional "/0" to "/128". The whole string must match.
  [[nodiscard]] static bool IsCIDRValid(const std::string& text);

  // Converts the UTF-8 host name `in` to its ASCII form (UTS #46, default
  // options) and appends it to `out`. Returns false, leaving `out` unchanged,
  // when the conversion reports any error.
  [[nodiscard]] static bool UTF8ToPunycode(const std::string& in, std::string& out);

  // True when the ASCII form of `name` is a host name of labels of 1 to 63
  // letters, digits and inner hyphens, separated by single dots, with an
  // optional trailing dot.
  [[nodiscard]] static bool IsSerNameValid(const std::string& name);
};

}  // namespace tavow3

#endif  // TAVOW3_VALIDATOR_H_
