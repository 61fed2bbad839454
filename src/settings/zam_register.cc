// ZAM's declarations to the engine, its custom-domain certificate, and its
// staged save and restart.
#include <tavow3/resource.h>
#include <tavow3/tls_registration.h>
#include <tavow3/zam.h>

#include <string>
#include <utility>

#include "base/log.h"
#include "settings/staged_save.h"
#include "settings/zam_resources.h"
#include "settings/zam_settings.h"

namespace tavow3 {
namespace {

constexpr char kLogTag[] = "zam";

constexpr char kStoredFile[] = "/usr/tavo/etc/www/ZAM.json";
constexpr char kStagingFile[] = "/var/tmp/nginx/ZAM.json";
constexpr char kScratchFile[] = "/var/tmp/nginx/ZAM.tmp";
// The custom domain's entry in the certificate store.
constexpr char kCrtSubscriber[] = "system";
constexpr char kCrtService[] = "FQDN";

using Schema = FQDNPortSchemaResource::Schema;

// The resources of the stored settings: the standard ports, the interface's
// own ports and, with a custom domain, that domain on each of the four.
// Refusals are not reported: the load cycle builds the table from every
// service and the first to claim a port keeps it.
void RegisterStored(Engine& engine, unsigned short http_port, unsigned short https_port,
                    const std::string& fqdn) {
  const FQDNPortSchemaResource rows[] = {
      FQDNPortSchemaResource("", 80, FQDNPortSchemaResource::HTTP, "http",
                             "firewall:firewall_service_opt_http", "HTTP",
                             "firewall:firewall_service_desc_http", /*protocol=*/0, "tavow3"),
      // The HTTPS row carries the HTTP description key on purpose.
      FQDNPortSchemaResource("", 443, FQDNPortSchemaResource::HTTPS, "https",
                             "firewall:firewall_service_opt_https", "HTTPS",
                             "firewall:firewall_service_desc_http", /*protocol=*/0, "tavow3"),
      ZamPortResource(http_port, FQDNPortSchemaResource::HTTP),
      ZamPortResource(https_port, FQDNPortSchemaResource::HTTPS),
  };
  for (const FQDNPortSchemaResource& row : rows) (void)RegisterFQDNPortSchemaResource(engine, row);
  if (fqdn.empty()) return;
  const std::pair<unsigned short, Schema> domain_rows[] = {
      {80, FQDNPortSchemaResource::HTTP},
      {443, FQDNPortSchemaResource::HTTPS},
      {http_port, FQDNPortSchemaResource::HTTP},
      {https_port, FQDNPortSchemaResource::HTTPS},
  };
  for (const auto& [port, schema] : domain_rows) {
    (void)RegisterFQDNPortSchemaResource(engine, ZamFQDNResource(fqdn, port, schema));
  }
}

}  // namespace

void ZAM::ResourceRegister(Engine& engine) {
  const ZAM stored(engine);
  RegisterStored(engine, stored.settings_->http_port, stored.settings_->https_port,
                 stored.settings_->fqdn);
}

void ZAM::ResourceRegisterV2(EngineV2& engine) {
  const ZAM stored(engine);
  engine.load();
  const std::string& fqdn = stored.settings_->fqdn;
  RegisterStored(engine.engine(), stored.settings_->http_port, stored.settings_->https_port, fqdn);
  if (fqdn.empty()) return;
  (void)RegisterCrtResource(engine, CrtResource(kCrtSubscriber, kCrtService, fqdn, ""));
}

bool ZAM::ProcessCertificate() {
  const std::string& fqdn = settings_->fqdn;
  if (fqdn.empty()) {
    if (!UnregisterCertificate(kCrtSubscriber, kCrtService)) {
      TAVOW3_LOG_ERR("Failed to unregister certificate for zam custom domain");
      return false;
    }
    return true;
  }
  if (!RegisterCertificate(kCrtSubscriber, kCrtService, fqdn, "")) {
    TAVOW3_LOG_ERR("Failed to register certificate for zam custom domain");
    return false;
  }
  return true;
}

bool ZAM::Update() { return W3Base::Update(); }

bool ZAM::Save() {
  if (!ProcessCertificate()) return false;
  return StagedSave(this, {kStagingFile, kStoredFile, kScratchFile,
                           /*drop_conf_on_update_failure=*/false,
                           /*drop_conf_on_move_failure=*/true});
}

bool ZAM::RestartService() {
  if (!W3Base::RestartService()) return false;
  return Engine::HupFirewall();
}

}  // namespace tavow3
