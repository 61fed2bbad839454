#include <tavow3/engine.h>

#include <fcntl.h>
#include <sys/file.h>

#include <boost/bind/bind.hpp>
#include <boost/make_shared.hpp>
#include <thread>

#include "base/file_io.h"
#include "base/file_lock.h"
#include "base/unique_fd.h"
#include "engine/engine_private.h"

namespace tavow3 {
namespace {

constexpr char kLockPath[] = "/run/lock/tavow3.lock";
constexpr mode_t kLockMode = 0444;
// Initial bucket count of the registry's hash tables.
constexpr size_t kInitialBuckets = 11;

enum LoadState : uint32_t { kNotLoaded = 0, kLoading = 1, kLoaded = 2 };

uint32_t CurrentThreadHash() {
  return static_cast<uint32_t>(std::hash<std::thread::id>{}(std::this_thread::get_id()));
}

// Closes *fd and marks it invalid; the flock goes with the descriptor.
void CloseLock(int* fd) {
  base::UniqueFd owned(*fd);
  *fd = -1;
}

// Runs every callback of `callbacks` with `engine`, in order. Indexing rather
// than iterators: a callback may append to the added list while it runs.
void RunCallbacks(const std::vector<EngineCallback>& callbacks, Engine& engine) {
  for (size_t i = 0; i < callbacks.size(); ++i) {
    EngineCallback callback = callbacks[i];
    callback(engine);
  }
}

}  // namespace

Engine::Private::Private()
    : port_schemas(kInitialBuckets), fqdn_resources(kInitialBuckets), names(kInitialBuckets) {
  port_schemas.max_load_factor(1.0f);
  fqdn_resources.max_load_factor(1.0f);
  names.max_load_factor(1.0f);
  // No error is reported here: the settings objects refuse to save when they
  // find no lock, and loading works without one.
  base::UniqueFd fd = base::Open(kLockPath, O_RDONLY | O_CREAT, kLockMode);
  if (fd && base::Flock(fd.get(), LOCK_SH)) lock_fd = fd.Release();
}

Engine::Private::~Private() {
  port_schemas.clear();
  fqdn_resources.clear();
  names.clear();
  CloseLock(&lock_fd);
}

bool Engine::Private::lock() {
  if (lock_fd < 0) return false;
  (void)base::Flock(lock_fd, LOCK_UN);
  if (base::Flock(lock_fd, LOCK_EX)) return true;
  CloseLock(&lock_fd);
  return false;
}

void Engine::Private::unlock() {
  if (lock_fd < 0) return;
  (void)base::Flock(lock_fd, LOCK_UN);
  if (!base::Flock(lock_fd, LOCK_SH)) CloseLock(&lock_fd);
}

std::vector<EngineCallback>& AddedCallbacks() {
  static std::vector<EngineCallback> callbacks;
  return callbacks;
}

Engine::Engine() : d_(boost::make_shared<Private>()) {}

void Engine::Register(boost::function<void(Engine&)> callback) {
  AddedCallbacks().push_back(std::move(callback));
}

void Engine::load() { load_callback(boost::bind(&Engine::load_func, this)); }

void Engine::load_callback(boost::function<void()> f) {
  Private& d = *d_;
  if (d.load_state.load(std::memory_order_acquire) == kLoaded) return;
  const uint32_t old = d.load_state.exchange(kLoading, std::memory_order_acq_rel);
  if (old == kLoading) {
    // The loading thread itself comes back here when a registration callback
    // loads a copy of this engine: it must see the partly filled registry
    // instead of waiting for itself.
    if (__atomic_load_n(&d.loader_thread, __ATOMIC_RELAXED) == CurrentThreadHash()) return;
    while (d.load_state.load(std::memory_order_acquire) != kLoaded) std::this_thread::yield();
    return;
  }
  if (old == kLoaded) {
    d.load_state.store(kLoaded, std::memory_order_release);
    return;
  }
  __atomic_store_n(&d.loader_thread, CurrentThreadHash(), __ATOMIC_RELAXED);
  // An exception from f leaves the state at "loading" and passes on.
  f();
  d.load_state.store(kLoaded, std::memory_order_release);
}

void Engine::load_func() {
  LoadPackagePlugin();
  RunCallbacks(BuiltinCallbacks(), *this);
  RunCallbacks(AddedCallbacks(), *this);
}

}  // namespace tavow3
