#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <new>
#include <vector>

#include "port_list.h"
#include "tavo/service_conf.h"

namespace {

using tavo::internal::NormalizeRanges;
using tavo::internal::ParsePortList;
using tavo::internal::PortRange;

// The ports of `candidates` that lie in `claimed`, ascending, at most `limit`.
// Both lists are normalised.
std::vector<int> Intersect(const std::vector<PortRange>& claimed,
                           const std::vector<PortRange>& candidates, int limit) {
  std::vector<int> ports;
  size_t i = 0;
  size_t j = 0;
  while (i < claimed.size() && j < candidates.size() && static_cast<int>(ports.size()) < limit) {
    int first = std::max(claimed[i].first, candidates[j].first);
    int last = std::min(claimed[i].last, candidates[j].last);
    for (int port = first; port <= last && static_cast<int>(ports.size()) < limit; ++port) {
      ports.push_back(port);
    }
    if (claimed[i].last < candidates[j].last) {
      ++i;
    } else {
      ++j;
    }
  }
  return ports;
}

// Builds the caller's list; null with errno ENOMEM when memory runs out.
TAVO_SERVICE_PORTS* MakeList(const std::vector<int>& ports) {
  TAVO_SERVICE_PORTS* head = nullptr;
  for (auto it = ports.rbegin(); it != ports.rend(); ++it) {
    auto* node = static_cast<TAVO_SERVICE_PORTS*>(std::malloc(sizeof(TAVO_SERVICE_PORTS)));
    if (node == nullptr) {
      TAVOServiceConfPortsFree(head);
      errno = ENOMEM;
      return nullptr;
    }
    node->port = *it;
    node->next = head;
    head = node;
  }
  return head;
}

}  // namespace

void TAVOServiceConfPortsFree(TAVO_SERVICE_PORTS* list) {
  while (list != nullptr) {
    TAVO_SERVICE_PORTS* next = list->next;
    std::free(list);
    list = next;
  }
}

int TLIBIsPortConflict(char* claimed, char* candidates, const char* proto, int max_conflicts,
                       TAVO_SERVICE_PORTS** conflicts) {
  if (claimed == nullptr || candidates == nullptr || proto == nullptr || conflicts == nullptr ||
      max_conflicts < 1 || (std::strcmp(proto, "tcp") != 0 && std::strcmp(proto, "udp") != 0)) {
    errno = EINVAL;
    return -1;
  }
  try {
    std::vector<PortRange> claimed_ranges;
    std::vector<PortRange> candidate_ranges;
    if (!ParsePortList(claimed, &claimed_ranges, nullptr) ||
        !ParsePortList(candidates, &candidate_ranges, nullptr)) {
      errno = EINVAL;
      return -1;
    }
    NormalizeRanges(&claimed_ranges);
    NormalizeRanges(&candidate_ranges);
    std::vector<int> ports = Intersect(claimed_ranges, candidate_ranges, max_conflicts);
    if (ports.empty()) {
      *conflicts = nullptr;
      return 0;
    }
    TAVO_SERVICE_PORTS* list = MakeList(ports);
    if (list == nullptr) return -1;
    *conflicts = list;
    return 1;
  } catch (const std::bad_alloc&) {
    errno = ENOMEM;
    return -1;
  }
}
