// Resource records that settings objects register with the engine.
#ifndef TAVOW3_RESOURCE_H_
#define TAVOW3_RESOURCE_H_

#include <string>

#include <tavow3/engine.h>
#include <tavow3/export.h>

namespace tavow3 {

// A listening port with the host name and schema it serves, and the firewall
// section that declares it. A value type; the engine stores a copy.
struct TAVOW3_EXPORT FQDNPortSchemaResource {
  enum Schema { HTTP = 0, HTTPS = 1 };

  FQDNPortSchemaResource() = default;
  FQDNPortSchemaResource(std::string fqdn, unsigned short port, Schema schema,
                         std::string section, std::string title_key, std::string desc,
                         std::string desc_key, int protocol, std::string owner);

  std::string fqdn;          // "" means any host name
  unsigned short port = 0;
  Schema schema = HTTP;
  std::string section;       // firewall section; "" lets the engine choose
  std::string title_key;     // localisation key of the firewall option label
  std::string desc;          // display text of the owner
  std::string desc_key;      // localisation key of the firewall description
  int protocol = 0;          // 0 TCP, 1 UDP, 2 both
  std::string owner;         // "tavow3" or "Pagora": which service file declares it
};

// A certificate consumer known to the certificate store under (subscriber,
// service), with its display name and that name's localisation key.
struct TAVOW3_EXPORT CrtResource {
  CrtResource() = default;
  CrtResource(std::string subscriber, std::string service, std::string display_name,
              std::string display_name_i18n);

  std::string subscriber;
  std::string service;
  std::string display_name;
  std::string display_name_i18n;
};

// Registers `resource` with `engine`: refused (false) when a foreign process
// uses the port, when the section name begins with the reserved "tavow3_",
// when the port is registered with the other schema, or when (host name,
// port) is registered already. Loads the engine first.
TAVOW3_EXPORT bool RegisterFQDNPortSchemaResource(Engine& engine,
                                                  const FQDNPortSchemaResource& resource);

// Removes the (host name, port) entry and one port-schema entry of `port`
// with that entry's schema. False when (host name, port) was not registered.
TAVOW3_EXPORT bool UnregisterFQDNPortSchemaResource(Engine& engine, const std::string& fqdn,
                                                    unsigned short port);

}  // namespace tavow3

#endif  // TAVOW3_RESOURCE_H_
