// ZAM's port and custom-domain setters: each moves the engine's registrations
// at once, registering the new resources before it drops the old ones, and
// rolls back what it registered when a later registration is refused.
#include <tavow3/resource.h>
#include <tavow3/validator.h>
#include <tavow3/zam.h>

#include <initializer_list>
#include <string>

#include "settings/zam_resources.h"
#include "settings/zam_settings.h"

namespace tavow3 {
namespace {

using Schema = FQDNPortSchemaResource::Schema;

enum FQDNResult { kFQDNOk = 0, kFQDNInvalid = 1, kFQDNRefused = 2 };

// The standard web ports, which a custom domain claims beside the interface's own.
constexpr unsigned short kStandardHttpPort = 80;
constexpr unsigned short kStandardHttpsPort = 443;

// Drops the registrations of `fqdn` on the ports of `ports`, in that order.
void UnregisterAll(Engine& engine, const std::string& fqdn,
                   std::initializer_list<unsigned short> ports) {
  // Each of them was registered by this object; a missing one is no error.
  for (unsigned short port : ports) (void)UnregisterFQDNPortSchemaResource(engine, fqdn, port);
}

}  // namespace

bool ZAM::RegisterPort(unsigned short port, Schema schema) {
  Engine handle = engine();
  if (!RegisterFQDNPortSchemaResource(handle, ZamPortResource(port, schema))) return false;
  const std::string& fqdn = settings_->fqdn;
  if (!fqdn.empty() &&
      !RegisterFQDNPortSchemaResource(handle, ZamFQDNResource(fqdn, port, schema))) {
    UnregisterAll(handle, "", {port});
    return false;
  }
  return true;
}

bool ZAM::SetPort(PortValidator validator, Schema schema, unsigned short* port) {
  const unsigned short requested = validator.port();
  if (requested == *port) return true;
  if (requested == 0) return false;
  if (!RegisterPort(requested, schema)) return false;
  SetDirty(true);
  Engine handle = engine();
  UnregisterAll(handle, "", {*port});
  if (!settings_->fqdn.empty()) UnregisterAll(handle, settings_->fqdn, {*port});
  *port = requested;
  return true;
}

bool ZAM::SetHttpPort(PortValidator validator) {
  return SetPort(validator, FQDNPortSchemaResource::HTTP, &settings_->http_port);
}

bool ZAM::SetHttpsPort(PortValidator validator) {
  return SetPort(validator, FQDNPortSchemaResource::HTTPS, &settings_->https_port);
}

int ZAM::setFQDNEx(const std::string& fqdn) {
  Settings& s = *settings_;
  if (fqdn == s.fqdn) return kFQDNOk;
  Engine handle = engine();
  if (!fqdn.empty()) {
    if (!Validator::IsSerNameValid(fqdn)) return kFQDNInvalid;
    const FQDNPortSchemaResource wanted[] = {
        ZamFQDNResource(fqdn, kStandardHttpPort, FQDNPortSchemaResource::HTTP),
        ZamFQDNResource(fqdn, kStandardHttpsPort, FQDNPortSchemaResource::HTTPS),
        ZamFQDNResource(fqdn, s.http_port, FQDNPortSchemaResource::HTTP),
        ZamFQDNResource(fqdn, s.https_port, FQDNPortSchemaResource::HTTPS),
    };
    for (size_t i = 0; i < sizeof(wanted) / sizeof(wanted[0]); ++i) {
      if (RegisterFQDNPortSchemaResource(handle, wanted[i])) continue;
      // Undo the ones taken so far, newest first.
      for (size_t j = i; j-- > 0;) UnregisterAll(handle, fqdn, {wanted[j].port});
      return kFQDNRefused;
    }
  }
  if (!s.fqdn.empty()) {
    UnregisterAll(handle, s.fqdn,
                  {kStandardHttpPort, kStandardHttpsPort, s.http_port, s.https_port});
  }
  s.fqdn = fqdn;
  SetDirty(true);
  return kFQDNOk;
}

}  // namespace tavow3
