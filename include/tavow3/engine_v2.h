// The second-generation engine: an Engine plus the security data (the
// certificate resources that settings objects declare), and the one-pass
// synchronisation of the certificate store and the TLS-profile framework.
#ifndef TAVOW3_ENGINE_V2_H_
#define TAVOW3_ENGINE_V2_H_

#include <boost/function.hpp>
#include <boost/shared_ptr.hpp>
#include <map>
#include <set>
#include <string>
#include <utility>

#include <tavow3/engine.h>
#include <tavow3/export.h>
#include <tavow3/resource.h>

namespace tavow3 {

// A cheap, copyable handle: copies share the carried Engine's private part and
// the security data. The load cycle is the carried engine's, so an Engine
// loaded through Engine::load() is not loaded again through an EngineV2 that
// carries it, and the reverse. Threads as Engine: the load runs once, the rest
// runs in the caller's thread without locks.
class TAVOW3_EXPORT EngineV2 {
 public:
  // Key of the certificate resources: (subscriber, service).
  using CrtKey = std::pair<std::string, std::string>;

  // The certificate resources and the subscribers that belong to packages.
  // Filled by the ResourceRegisterV2 callbacks during the load cycle.
  struct Security {
    std::map<CrtKey, CrtResource> crt_resources;
    std::set<std::string> package_subscribers;
  };

  // A new Engine (fresh private part) and empty security data.
  EngineV2();
  // Carries `engine` (sharing its registry and load state) with new, empty
  // security data.
  explicit EngineV2(const Engine& engine);

  // Appends `callback` to the same process-wide list as Engine::Register; it
  // receives the carried Engine during every load cycle.
  static void Register(boost::function<void(Engine&)> callback);

  // Runs load_func at most once through the carried engine's run-once guard.
  void load();
  // The body of the load cycle: the package plug-in, the built-in
  // ResourceRegisterV2 callbacks with this EngineV2, then the added callbacks
  // with the carried Engine.
  void load_func();

  // Loads, writes one certificate document per subscriber, runs the
  // certificate-registration tool for each, and, only when all of them
  // succeeded, joins every certificate resource to the TLS-profile framework.
  // True when the framework accepted the service list.
  [[nodiscard]] bool W3SyncCrtInfo();
  // The carried engine's W3FwReGenAll(): 1 success, 0 failure.
  int W3FwReGenAll();

  Engine& engine() { return engine_; }
  const Engine& engine() const { return engine_; }
  // The shared security data (never null).
  Security& security() const { return *security_; }

 private:
  Engine engine_;
  boost::shared_ptr<Security> security_;
};

// The type of the built-in ResourceRegisterV2 callbacks.
using EngineV2Callback = boost::function<void(EngineV2&)>;

// Loads `engine`, then stores `resource` under (subscriber, service). A
// second registration under a key already held keeps the first record and
// returns false; otherwise returns true. Called from ResourceRegisterV2
// callbacks (the reentrant load returns at once there).
TAVOW3_EXPORT bool RegisterCrtResource(EngineV2& engine, const CrtResource& resource);

// Loads `engine`, then marks `subscriber` as belonging to a package: its
// certificate document gets "isPkg" true. A ResourceRegisterV2 callback of a
// package's settings calls this beside RegisterCrtResource; declaring a
// subscriber twice is harmless.
TAVOW3_EXPORT void RegisterPackageSubscriber(EngineV2& engine, const std::string& subscriber);

}  // namespace tavow3

#endif  // TAVOW3_ENGINE_V2_H_
