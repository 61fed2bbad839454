#include "settings/zam_resources.h"

namespace tavow3 {

FQDNPortSchemaResource ZamPortResource(unsigned short port, FQDNPortSchemaResource::Schema schema) {
  const bool https = schema == FQDNPortSchemaResource::HTTPS;
  return FQDNPortSchemaResource(
      "", port, schema, https ? "zma_https" : "zma",
      https ? "firewall:firewall_service_opt_zam_https" : "firewall:firewall_service_opt_zam_http",
      "ZAM",
      https ? "firewall:firewall_service_desc_zam_https"
            : "firewall:firewall_service_desc_zam_http",
      /*protocol=*/0, "tavow3");
}

FQDNPortSchemaResource ZamFQDNResource(const std::string& fqdn, unsigned short port,
                                       FQDNPortSchemaResource::Schema schema) {
  return FQDNPortSchemaResource(fqdn, port, schema, "", "", "", "", /*protocol=*/0, "");
}

}  // namespace tavow3
