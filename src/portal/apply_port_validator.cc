#include "portal/apply_port_validator.h"

namespace tavow3 {

PortChange ApplyPortValidator(Engine& engine, const PortValidator& requested,
                              FQDNPortSchemaResource resource, unsigned short* port) {
  if (requested.port() == *port) return PortChange::kUnchanged;
  if (requested.port() == 0) return PortChange::kRefused;
  resource.port = requested.port();
  if (!RegisterFQDNPortSchemaResource(engine, resource)) return PortChange::kRefused;
  // The old port was registered by this setter; its absence is no error.
  if (*port != 0) (void)UnregisterFQDNPortSchemaResource(engine, resource.fqdn, *port);
  *port = requested.port();
  return PortChange::kChanged;
}

}  // namespace tavow3
