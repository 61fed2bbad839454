// ZAM's settings model: defaults, flags, connection limits, TLS profile,
// server header and trusted proxies.
#include <sys/sysinfo.h>
#include <tavo/tavotls.h>
#include <tavow3/nginx_conf_manager.h>
#include <tavow3/zam.h>

#include <algorithm>
#include <utility>

#include "base/log.h"
#include "settings/zam_settings.h"

namespace tavow3 {
namespace {

constexpr char kLogTag[] = "zam";

constexpr unsigned short kHttpDefaultPort = 5000;
constexpr unsigned short kHttpsDefaultPort = 5001;
constexpr char kDefaultCertificate[] = "/usr/tavo/etc/ssl/ssl.chain.crt/server.crt";
constexpr char kDefaultKey[] = "/usr/tavo/etc/ssl/ssl.key/server.key";
constexpr char kDefaultServerHeader[] = "nginx";
// The per-worker connection settings that bound the total.
constexpr int kLowerWorkerConnections = 1024;
constexpr int kUpperWorkerConnections = 65535;
// The management interface's entry in the TLS data store.
constexpr char kTLSService[] = "zam";
// GetMode's answer while the web server runs its management-only configuration.
constexpr int kDefaultMode = 2;

int TavoTLSToTLSProfile(int level) {
  switch (level) {
    case 3:
      return 0;
    case 2:
      return 1;
    case 1:
      return 2;
    default:
      TAVOW3_LOG_ERR("tavotls2tlsprofile get invalid value %d, returning failsafe value.", level);
      return 1;
  }
}

int TLSProfileToTavoTLS(int profile) {
  switch (profile) {
    case 0:
      return 3;
    case 1:
      return 2;
    case 2:
      return 1;
    default:
      TAVOW3_LOG_ERR("tlsprofile2tavotls get invalid value %d, returning failsafe value.", profile);
      return 2;
  }
}

bool IsDefaultModeRunning() { return NginxConfManager(NGINXCONF_GET_MODE).run() == kDefaultMode; }

// Stores `value` in *field; marks `object` dirty only on a change.
bool SetFlag(W3Base* object, bool* field, bool value) {
  if (*field != value) {
    object->SetDirty(true);
    *field = value;
  }
  return true;
}

}  // namespace

ZAM::ZAM(Engine engine) : W3Base(std::move(engine)), settings_(new Settings) { Get(); }

ZAM::ZAM(EngineV2 engine) : W3Base(std::move(engine)), settings_(new Settings) { Get(); }

ZAM::~ZAM() = default;

void ZAM::DataInit() {
  Settings& s = *settings_;
  s.http_port = kHttpDefaultPort;
  s.https_port = kHttpsDefaultPort;
  s.spdy = false;
  s.hsts = false;
  s.https_redirect = false;
  s.certificate = kDefaultCertificate;
  s.key = kDefaultKey;
  s.access_default_port = false;
  s.fqdn.clear();
  s.http_compression = false;
  s.customized_max_connections = false;
  s.max_connections = 0;
  s.upper_limit_connections = Worker2MaxConnections(kUpperWorkerConnections);
  s.lower_limit_connections = Worker2MaxConnections(kLowerWorkerConnections);
  s.server_header = kDefaultServerHeader;
  s.trust_proxies.clear();
  SetDirty(false);
  SetOK(false);
}

bool ZAM::SetEnableSPDY(bool enable) { return SetFlag(this, &settings_->spdy, enable); }
bool ZAM::SetEnableSPDY() { return SetEnableSPDY(true); }
bool ZAM::SetDisableSPDY() { return SetEnableSPDY(false); }
bool ZAM::GetEnableSPDY() const { return settings_->spdy; }

bool ZAM::setHSTS(bool enable) { return SetFlag(this, &settings_->hsts, enable); }
bool ZAM::getHSTS() const { return settings_->hsts; }

bool ZAM::SetEnableHttpsRedirect(bool enable) {
  return SetFlag(this, &settings_->https_redirect, enable);
}
bool ZAM::SetEnableHttpsRedirect() { return SetEnableHttpsRedirect(true); }
bool ZAM::SetDisableHttpsRedirect() { return SetEnableHttpsRedirect(false); }
bool ZAM::GetEnableHttpsRedirect() const { return settings_->https_redirect; }

bool ZAM::SetEnableAccessDefaultPort(bool enable) {
  return SetFlag(this, &settings_->access_default_port, enable);
}
bool ZAM::SetEnableAccessDefaultPort() { return SetEnableAccessDefaultPort(true); }
bool ZAM::SetDisableAccessDefaultPort() { return SetEnableAccessDefaultPort(false); }
bool ZAM::GetEnableAccessDefaultPort() const { return settings_->access_default_port; }

bool ZAM::setHTTPCompression(bool enable) {
  return SetFlag(this, &settings_->http_compression, enable);
}
bool ZAM::getHTTPCompression() const { return settings_->http_compression; }

unsigned short ZAM::GetHttpDefaultPort() const { return kHttpDefaultPort; }
unsigned short ZAM::GetHttpsDefaultPort() const { return kHttpsDefaultPort; }

unsigned short ZAM::GetHttpPort() const {
  return IsDefaultModeRunning() ? kHttpDefaultPort : settings_->http_port;
}

unsigned short ZAM::GetHttpsPort() const {
  return IsDefaultModeRunning() ? kHttpsDefaultPort : settings_->https_port;
}

std::string ZAM::getFQDN() const { return settings_->fqdn; }

bool ZAM::setFQDN(const std::string& fqdn) { return setFQDNEx(fqdn) == 0; }

// get_nprocs() counts the processors online, as the web server's
// "worker_processes auto" does.
int ZAM::Worker2MaxConnections(int worker_connections) {
  return (get_nprocs() * worker_connections) / 2;
}

int ZAM::MAX2WorkerConnections(int max_connections) { return (2 * max_connections) / get_nprocs(); }

bool ZAM::SetMaxConnections(int max_connections) {
  if (max_connections < settings_->lower_limit_connections ||
      max_connections > settings_->upper_limit_connections) {
    return false;
  }
  settings_->customized_max_connections = true;
  settings_->max_connections = max_connections;
  return true;
}

bool ZAM::SetEnableCustomizedMaxConnections(bool enable) {
  settings_->customized_max_connections = enable;
  if (!enable) settings_->max_connections = 0;
  return true;
}

int ZAM::GetMaxConnections() const {
  return settings_->customized_max_connections ? settings_->max_connections
                                               : settings_->lower_limit_connections;
}

bool ZAM::IsCustomizedMaxConnections() const { return settings_->customized_max_connections; }
int ZAM::GetUpperLimitMaxConnections() const { return settings_->upper_limit_connections; }
int ZAM::GetLowerLimitMaxConnections() const { return settings_->lower_limit_connections; }

int ZAM::CorrectMaxConnections(int max_connections) const {
  if (max_connections < settings_->lower_limit_connections) {
    return settings_->lower_limit_connections;
  }
  return std::min(max_connections, settings_->upper_limit_connections);
}

int ZAM::getTLSProfile() const {
  return TavoTLSToTLSProfile(tavotls::DataStoreProvider::get_service_level(kTLSService));
}

bool ZAM::setTLSProfile(int profile) {
  if (static_cast<unsigned>(profile) > 2) return false;
  if (profile == getTLSProfile()) return true;
  // The setter answers for the profile's validity only; the store keeps and
  // reports the level itself.
  (void)tavotls::DataStoreProvider::set_service_level(kTLSService, TLSProfileToTavoTLS(profile));
  SetDirty(true);
  return true;
}

bool ZAM::SetServerHeader(bool enable, const std::string& name) {
  settings_->server_header = enable ? name : std::string();
  return true;
}

std::string ZAM::GetServerHeader() const { return settings_->server_header; }
bool ZAM::GetEnableServerHeader() const { return !settings_->server_header.empty(); }

bool ZAM::SetTrustProxyList(const std::vector<std::string>& proxies) {
  settings_->trust_proxies = proxies;
  return true;
}

std::vector<std::string> ZAM::GetTrustProxyList() const { return settings_->trust_proxies; }

}  // namespace tavow3
