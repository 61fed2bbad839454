#include <tavow3/wwwservice.h>

#include <tavow3/resource.h>

#include "base/file_io.h"
#include "base/log.h"
#include "settings/staged_save.h"

namespace tavow3 {
namespace {

constexpr char kLogTag[] = "wwwservice";
constexpr char kStoredFile[] = "/usr/tavo/etc/www/WWWService.json";
constexpr char kStagingFile[] = "/var/tmp/nginx/WWWService.json";
constexpr char kScratchFile[] = "/var/tmp/nginx/WWWService.tmp";
// Like every settings file of the library: owner 1:1, mode 0644.
constexpr base::FileMode kStagingMode = {1, 1, 0644};

}  // namespace

struct WWWService::Settings {
  unsigned short http_port = 0;
  bool https_enabled = true;
  unsigned short https_port = 0;
  std::string cert;
  std::string key;
  bool spdy = false;
  bool hsts = false;
};

WWWService::WWWService(Engine engine) : W3Base(std::move(engine)), settings_(new Settings) {
  Get();
}

WWWService::WWWService(EngineV2 engine) : W3Base(std::move(engine)), settings_(new Settings) {
  Get();
}

WWWService::~WWWService() = default;

void WWWService::DataInit() {
  *settings_ = Settings();
  settings_->cert = "/usr/tavo/etc/ssl/ssl.chain.crt/server.crt";
  settings_->key = "/usr/tavo/etc/ssl/ssl.key/server.key";
  SetDirty(false);
  SetOK(false);
}

bool WWWService::GetJson(Json::Value& value) {
  if (!ReadJsonFile(kStoredFile, value, /*allowMissing=*/true)) {
    TAVOW3_LOG_ERR("Failed to read pagora config");
    return false;
  }
  return true;
}

bool WWWService::SetJson(Json::Value& value) {
  if (!base::ReplaceFile(kStagingFile, value.toStyledString(), kStagingMode)) {
    TAVOW3_LOG_ERR("Failed to write pagora config");
    return false;
  }
  return true;
}

void WWWService::TransJsonToVar(Json::Value& json) {
  // A document that is not an object holds no key: the defaults stay.
  if (json.empty() || !json.isObject()) return;
  const Json::Value& value = json;
  const Json::Value& ports = value["additionalPort"];
  const bool has_ports = ports.isObject() && !ports.isNull();
  if (has_ports && ports["http"].isInt()) {
    settings_->http_port = static_cast<unsigned short>(ports["http"].asInt());
  }
  if (!value.isMember("ssl") || !value["ssl"].isObject() || value["ssl"].isNull()) return;
  const Json::Value& ssl = value["ssl"];
  if (has_ports && ports["https"].isInt()) {
    settings_->https_port = static_cast<unsigned short>(ports["https"].asInt());
  }
  if (ssl["certificate"].isString() && !ssl["certificate"].asString().empty()) {
    settings_->cert = ssl["certificate"].asString();
  }
  if (ssl["key"].isString() && !ssl["key"].asString().empty()) {
    settings_->key = ssl["key"].asString();
  }
  if (ssl["spdy"].isBool()) settings_->spdy = ssl["spdy"].asBool();
  if (ssl["hsts"].isBool()) settings_->hsts = ssl["hsts"].asBool();
}

bool WWWService::TransVarToJson(Json::Value& value) {
  value["version"] = 1;
  bool wrote_port = false;
  if (settings_->http_port != 0) {
    value["additionalPort"]["http"] = settings_->http_port;
    wrote_port = true;
  }
  if (settings_->https_enabled) {
    if (settings_->https_port != 0) {
      value["additionalPort"]["https"] = settings_->https_port;
      wrote_port = true;
    }
    Json::Value& ssl = value["ssl"];
    ssl["certificate"] = settings_->cert;
    ssl["key"] = settings_->key;
    ssl["spdy"] = settings_->spdy;
    ssl["hsts"] = settings_->hsts;
  } else {
    value["ssl"] = Json::Value::null;
  }
  if (!wrote_port) value["additionalPort"] = Json::Value::null;
  return true;
}

bool WWWService::Update() { return W3Base::Update(); }

bool WWWService::Save() {
  return StagedSave(this, {kStagingFile, kStoredFile, kScratchFile,
                           /*drop_conf_on_update_failure=*/true,
                           /*drop_conf_on_move_failure=*/false});
}

bool WWWService::RestartService() {
  if (!W3Base::RestartService()) return false;
  return Engine::HupFirewall();
}

unsigned short WWWService::GetHttpAddPort() const { return settings_->http_port; }
bool WWWService::GetEnableHttpAddPort() const { return settings_->http_port != 0; }
unsigned short WWWService::GetHttpsAddPort() const { return settings_->https_port; }
bool WWWService::GetEnableHttpsAddPort() const { return settings_->https_port != 0; }
std::string WWWService::GetCERT() const { return settings_->cert; }
std::string WWWService::GetKEY() const { return settings_->key; }
bool WWWService::GetEnableSPDY() const { return settings_->spdy; }
bool WWWService::GetEnableHSTS() const { return settings_->hsts; }

void WWWService::ResourceRegister(Engine& engine) {
  const WWWService stored(engine);
  if (stored.GetEnableHttpAddPort()) {
    (void)RegisterFQDNPortSchemaResource(
        engine, FQDNPortSchemaResource("", stored.GetHttpAddPort(), FQDNPortSchemaResource::HTTP,
                                       "http_extra", "firewall:firewall_service_opt_http_extra",
                                       "Pagora", "firewall:firewall_service_desc_http",
                                       /*protocol=*/0, "tavow3"));
  }
  if (stored.GetEnableHttpsAddPort()) {
    // The HTTPS port carries the HTTP description key on purpose.
    (void)RegisterFQDNPortSchemaResource(
        engine, FQDNPortSchemaResource("", stored.GetHttpsAddPort(), FQDNPortSchemaResource::HTTPS,
                                       "https_extra", "firewall:firewall_service_opt_https_extra",
                                       "Pagora", "firewall:firewall_service_desc_http",
                                       /*protocol=*/0, "tavow3"));
  }
}

void WWWService::ResourceRegisterV2(EngineV2& engine) {
  Engine carried = engine.engine();
  ResourceRegister(carried);
}

}  // namespace tavow3
