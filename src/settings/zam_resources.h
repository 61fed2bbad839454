// The port resources that ZAM declares to the engine.
#ifndef TAVOW3_SRC_SETTINGS_ZAM_RESOURCES_H_
#define TAVOW3_SRC_SETTINGS_ZAM_RESOURCES_H_

#include <tavow3/resource.h>

#include <string>

namespace tavow3 {

// The interface's own HTTP ("zma") or HTTPS ("zma_https") port for any host.
FQDNPortSchemaResource ZamPortResource(unsigned short port, FQDNPortSchemaResource::Schema schema);

// The custom domain `fqdn` on `port`: no firewall section or texts of its own,
// the port's firewall entry is the one of the any-host resource.
FQDNPortSchemaResource ZamFQDNResource(const std::string& fqdn, unsigned short port,
                                       FQDNPortSchemaResource::Schema schema);

}  // namespace tavow3

#endif  // TAVOW3_SRC_SETTINGS_ZAM_RESOURCES_H_
