#include <dlfcn.h>

#include <mutex>
#include <string>

#include "base/dynamic_library.h"
#include "base/file_io.h"
#include "base/log.h"
#include "engine/engine_private.h"

namespace tavow3 {
namespace {

constexpr char kLogTag[] = "engine";
constexpr char kPackageEnabled[] = "/var/packages/Pagora/enabled";
constexpr char kPackageLibrary[] = "/var/packages/Pagora/target/lib/libtavopagora.so";

// Engines loading at the same time in two threads: the second waits here until
// the library's initialisers have registered, then runs the complete list.
// Recursive, and the flag set before the load, because an initialiser may
// itself load an engine.
std::recursive_mutex plugin_mutex;
bool plugin_attempted = false;  // Guarded by plugin_mutex.

}  // namespace

void LoadPackagePlugin() {
  std::lock_guard<std::recursive_mutex> hold(plugin_mutex);
  // Until the package is enabled every load cycle looks again; after one
  // attempt, successful or not, none does.
  if (plugin_attempted || !base::Exists(kPackageEnabled)) return;
  plugin_attempted = true;
  std::string error;
  // The library stays loaded (RTLD_NODELETE): its static initialisers have
  // added callbacks that point into it.
  if (!base::LoadLibraryOnce(kPackageLibrary, RTLD_LAZY | RTLD_NODELETE, &error)) {
    TAVOW3_LOG_ERR_AT(62, "Failed to load tavopagora lib, %s", error.c_str());
  }
}

}  // namespace tavow3
