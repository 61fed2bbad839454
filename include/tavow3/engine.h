// The engine: the process-local registry into which every settings object
// declares the resources it needs, and the holder of the library's
// cross-process lock "/run/lock/tavow3.lock".
#ifndef TAVOW3_ENGINE_H_
#define TAVOW3_ENGINE_H_

#include <boost/function.hpp>
#include <boost/shared_ptr.hpp>
#include <string>

#include <tavow3/export.h>

namespace tavow3 {

// A cheap, copyable handle on one shared registry (Engine::Private). Copies
// share the registry, which lives as long as the last copy. The registry is
// filled once per private part, on first use, by the load cycle; one private
// part may be used from several threads (the load runs once, the others wait).
class TAVOW3_EXPORT Engine {
 public:
  class Private;

  // A new private part: opens and share-locks the lock file (descriptor -1,
  // silently, when that fails), with an empty registry that is not loaded.
  Engine();

  // Appends `callback` to the process-wide list that every load cycle runs
  // after the built-in registrations. Not locked: meant for static
  // initialisers of libraries that extend the engine.
  static void Register(boost::function<void(Engine&)> callback);

  // Runs the load cycle at most once for this private part.
  void load();
  // The run-once guard of load(): runs `f` the first time; a re-entry from the
  // loading thread returns at once, other threads yield until it finished.
  // An exception from `f` passes to the caller.
  void load_callback(boost::function<void()> f);
  // The body of the load cycle: package plug-in, built-in, then added callbacks.
  void load_func();

  // Regenerates and installs the firewall service file of `owner` from the
  // registry (loading it first). True on success; an owner without resources
  // has its installed file deleted.
  bool GenerateFirewallConfig(const std::string& owner);
  // GenerateFirewallConfig("tavow3"): 1 on success, 0 on failure.
  int W3FwReGenAll();
  // Publishes changed service files to the firewall service and reloads the
  // firewall. True when every notification succeeded.
  static bool HupFirewall();
  // True when a process other than the running web server uses TCP `port`.
  // Thread-safe; the answer is a snapshot.
  static bool IsRuntimeTCPPortConflict(unsigned short port);

  // The shared private part (never null).
  Private& impl() const { return *d_; }

 private:
  boost::shared_ptr<Private> d_;
};

}  // namespace tavow3

#endif  // TAVOW3_ENGINE_H_
