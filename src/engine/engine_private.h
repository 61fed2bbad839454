// The shared private part of Engine and the process-wide callback lists.
#ifndef TAVOW3_SRC_ENGINE_ENGINE_PRIVATE_H_
#define TAVOW3_SRC_ENGINE_ENGINE_PRIVATE_H_

#include <atomic>
#include <boost/function.hpp>
#include <cstdint>
#include <functional>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <utility>
#include <vector>

#include <tavow3/engine.h>
#include <tavow3/resource.h>

#include "base/export.h"

namespace tavow3 {

// Key of the host-name resources: (host name, port).
using FQDNPortKey = std::pair<std::string, unsigned short>;

struct TAVOW3_INTERNAL FQDNPortKeyHash {
  size_t operator()(const FQDNPortKey& key) const;
};

class TAVOW3_INTERNAL Engine::Private {
 public:
  Private();
  ~Private();
  Private(const Private&) = delete;
  Private& operator=(const Private&) = delete;

  // Shared to exclusive. False (and descriptor -1 when the exclusive flock
  // failed) when there is no lock.
  bool lock();
  // Exclusive back to shared; on failure the descriptor is closed and -1.
  void unlock();

  int lock_fd = -1;
  std::atomic<uint32_t> load_state{0};  // 0 new, 1 loading, 2 loaded
  uint32_t loader_thread = 0;           // hash of the loading thread's id
  std::unordered_multimap<unsigned short, FQDNPortSchemaResource::Schema> port_schemas;
  std::unordered_map<FQDNPortKey, FQDNPortSchemaResource, FQDNPortKeyHash> fqdn_resources;
  std::unordered_set<std::string> names;
};

using EngineCallback = boost::function<void(Engine&)>;

// Registration callbacks of the library's settings classes, in their fixed
// order (defined beside the settings classes, in src/registrations.cc).
TAVOW3_INTERNAL const std::vector<EngineCallback>& BuiltinCallbacks();
// Callbacks appended by Engine::Register and EngineV2::Register.
TAVOW3_INTERNAL std::vector<EngineCallback>& AddedCallbacks();
// Step one of every load cycle: dlopen the web-hosting package's library
// while the package is enabled, once per process.
TAVOW3_INTERNAL void LoadPackagePlugin();

}  // namespace tavow3

#endif  // TAVOW3_SRC_ENGINE_ENGINE_PRIVATE_H_
