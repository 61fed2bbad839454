#include <tavow3/resource.h>

#include <boost/functional/hash.hpp>
#include <utility>

#include "base/log.h"
#include "engine/engine_private.h"

namespace tavow3 {
namespace {

constexpr char kLogTag[] = "resource";
// Section names with this prefix belong to the engine's own choice of names.
constexpr char kReservedSectionPrefix[] = "tavow3_";
constexpr size_t kReservedSectionPrefixLength = sizeof(kReservedSectionPrefix) - 1;

}  // namespace

FQDNPortSchemaResource::FQDNPortSchemaResource(std::string fqdn, unsigned short port,
                                               Schema schema, std::string section,
                                               std::string title_key, std::string desc,
                                               std::string desc_key, int protocol,
                                               std::string owner)
    : fqdn(std::move(fqdn)),
      port(port),
      schema(schema),
      section(std::move(section)),
      title_key(std::move(title_key)),
      desc(std::move(desc)),
      desc_key(std::move(desc_key)),
      protocol(protocol),
      owner(std::move(owner)) {}

CrtResource::CrtResource(std::string subscriber, std::string service, std::string display_name,
                         std::string display_name_i18n)
    : subscriber(std::move(subscriber)),
      service(std::move(service)),
      display_name(std::move(display_name)),
      display_name_i18n(std::move(display_name_i18n)) {}

size_t FQDNPortKeyHash::operator()(const FQDNPortKey& key) const {
  size_t seed = std::hash<std::string>{}(key.first);
  boost::hash_combine(seed, key.second);
  return seed;
}

bool RegisterFQDNPortSchemaResource(Engine& engine, const FQDNPortSchemaResource& resource) {
  // A port that a foreign process holds is refused before the registry is
  // even looked at.
  if (Engine::IsRuntimeTCPPortConflict(resource.port)) return false;
  engine.load();
  if (resource.section.compare(0, kReservedSectionPrefixLength, kReservedSectionPrefix) == 0) {
    TAVOW3_LOG_ERR_AT(224, "Firewall section has wrong section name");
    return false;
  }
  Engine::Private& d = engine.impl();
  // One schema per port, whatever the host names.
  const auto schema = d.port_schemas.find(resource.port);
  if (schema != d.port_schemas.end() && schema->second != resource.schema) return false;
  FQDNPortKey key(resource.fqdn, resource.port);
  if (d.fqdn_resources.count(key) != 0) return false;
  d.port_schemas.emplace(resource.port, resource.schema);
  d.fqdn_resources.emplace(std::move(key), resource);
  return true;
}

bool UnregisterFQDNPortSchemaResource(Engine& engine, const std::string& fqdn,
                                      unsigned short port) {
  engine.load();
  Engine::Private& d = engine.impl();
  const auto resource = d.fqdn_resources.find(FQDNPortKey(fqdn, port));
  if (resource == d.fqdn_resources.end()) return false;
  const FQDNPortSchemaResource::Schema schema = resource->second.schema;
  d.fqdn_resources.erase(resource);
  const auto range = d.port_schemas.equal_range(port);
  for (auto entry = range.first; entry != range.second; ++entry) {
    if (entry->second == schema) {
      d.port_schemas.erase(entry);
      break;
    }
  }
  return true;
}

}  // namespace tavow3
