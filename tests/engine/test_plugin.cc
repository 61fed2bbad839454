// Stands in for the web-hosting package's library: when loaded, it adds a
// callback that registers one record per load cycle, named after how often
// the callback ran ("plugin1", "plugin2", ...).
#include <string>

#include <tavow3/engine.h>
#include <tavow3/resource.h>

namespace {

int runs = 0;

void RegisterPackageResources(tavow3::Engine& engine) {
  ++runs;
  (void)tavow3::RegisterFQDNPortSchemaResource(
      engine, tavow3::FQDNPortSchemaResource("plugin" + std::to_string(runs), 8443,
                                             tavow3::FQDNPortSchemaResource::HTTPS, "", "",
                                             "Pagora", "", 0, "Pagora"));
}

struct Registrar {
  Registrar() { tavow3::Engine::Register(&RegisterPackageResources); }
} registrar;

}  // namespace
