#include "port_list.h"

#include <algorithm>

namespace tavo::internal {
namespace {

constexpr std::string_view kBlanks = " \t\r\n";
constexpr int kMaxPort = 65535;

std::string_view Trim(std::string_view text) {
  std::string_view::size_type begin = text.find_first_not_of(kBlanks);
  if (begin == std::string_view::npos) return {};
  return text.substr(begin, text.find_last_not_of(kBlanks) - begin + 1);
}

// A port in decimal digits only, 1 to 65535.
bool ParsePort(std::string_view text, int* port) {
  text = Trim(text);
  if (text.empty()) return false;
  int value = 0;
  for (char c : text) {
    if (c < '0' || c > '9') return false;
    value = value * 10 + (c - '0');
    if (value > kMaxPort) return false;
  }
  if (value == 0) return false;
  *port = value;
  return true;
}

bool ParseEntry(std::string_view entry, PortRange* range) {
  std::string_view::size_type colon = entry.find(':');
  if (colon == std::string_view::npos) {
    if (!ParsePort(entry, &range->first)) return false;
    range->last = range->first;
    return true;
  }
  return ParsePort(entry.substr(0, colon), &range->first) &&
         ParsePort(entry.substr(colon + 1), &range->last) && range->first <= range->last;
}

}  // namespace

bool ParsePortList(std::string_view text, std::vector<PortRange>* ranges,
                   std::vector<std::string>* entries) {
  for (;;) {
    std::string_view::size_type comma = text.find(',');
    std::string_view entry = Trim(text.substr(0, comma));
    if (!entry.empty()) {
      PortRange range;
      if (!ParseEntry(entry, &range)) return false;
      ranges->push_back(range);
      if (entries != nullptr) entries->emplace_back(entry);
    }
    if (comma == std::string_view::npos) return true;
    text.remove_prefix(comma + 1);
  }
}

void NormalizeRanges(std::vector<PortRange>* ranges) {
  std::sort(ranges->begin(), ranges->end(),
            [](const PortRange& a, const PortRange& b) { return a.first < b.first; });
  std::vector<PortRange> merged;
  for (const PortRange& range : *ranges) {
    if (!merged.empty() && range.first <= merged.back().last + 1) {
      merged.back().last = std::max(merged.back().last, range.last);
    } else {
      merged.push_back(range);
    }
  }
  ranges->swap(merged);
}

}  // namespace tavo::internal
