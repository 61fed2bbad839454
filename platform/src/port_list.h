// Comma-separated port lists of the firewall service files: single ports and
// inclusive ranges "A:B", each from 1 to 65535.
#ifndef TAVO_PLATFORM_PORT_LIST_H_
#define TAVO_PLATFORM_PORT_LIST_H_

#include <string>
#include <string_view>
#include <vector>

// Internal to the library: not exported.
#pragma GCC visibility push(hidden)

namespace tavo::internal {

// Inclusive; first <= last.
struct PortRange {
  int first;
  int last;
};

// Parses `text`. Blanks around entries and around the ':' of a range are
// allowed and empty entries (",,", a trailing comma) are skipped. On success
// appends the ranges to *ranges and, when `entries` is not null, each entry
// as written (without surrounding blanks) to *entries. Returns false for
// anything else, such as a port out of range, a reversed range or a sign;
// the outputs may then hold part of the list.
bool ParsePortList(std::string_view text, std::vector<PortRange>* ranges,
                   std::vector<std::string>* entries);

// Sorts `ranges` and merges overlapping and adjacent ones.
void NormalizeRanges(std::vector<PortRange>* ranges);

}  // namespace tavo::internal

#pragma GCC visibility pop

#endif  // TAVO_PLATFORM_PORT_LIST_H_
