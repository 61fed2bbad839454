// ZAM's settings file: reading with the factory fall-back, the rules by which
// keys are taken, and the layout written.
#include <tavow3/validator.h>
#include <tavow3/zam.h>

#include <cstring>
#include <string>

#include "base/log.h"
#include "settings/zam_settings.h"

namespace tavow3 {
namespace {

constexpr char kLogTag[] = "zam";

constexpr char kStoredFile[] = "/usr/tavo/etc/www/ZAM.json";
constexpr char kFactoryFile[] = "/usr/tavo/etc.defaults/www/ZAM.json";
constexpr char kStagingFile[] = "/var/tmp/nginx/ZAM.json";
constexpr int kSettingsVersion = 1;

// `value`'s member `key` when `value` is an object that has it, else null.
// Never adds a member.
const Json::Value& Member(const Json::Value& value, const char* key) {
  static const Json::Value kAbsent;
  if (!value.isObject()) return kAbsent;
  const Json::Value* member = value.find(key, key + std::strlen(key));
  return member != nullptr ? *member : kAbsent;
}

void TakeBool(const Json::Value& value, const char* key, bool* field) {
  const Json::Value& member = Member(value, key);
  if (member.isBool()) *field = member.asBool();
}

// A non-empty string, else the field stays.
void TakePath(const Json::Value& value, const char* key, std::string* field) {
  const Json::Value& member = Member(value, key);
  if (member.isString() && !member.asString().empty()) *field = member.asString();
}

Json::Value StringOrNull(const std::string& text) {
  return text.empty() ? Json::Value() : Json::Value(text);
}

}  // namespace

bool ZAM::GetJson(Json::Value& value) {
  if (ReadJsonFile(kStoredFile, value, /*allowMissing=*/false)) return true;
  TAVOW3_LOG_ERR("Failed to read ZAM nginx config. Use default setting.");
  // The factory file is only checked: the built-in defaults are authoritative,
  // so the result stays false and Get() keeps them.
  if (!ReadJsonFile(kFactoryFile, value, /*allowMissing=*/false)) {
    TAVOW3_LOG_ERR("Failed to read ZAM nginx default config.");
  }
  return false;
}

bool ZAM::SetJson(Json::Value& value) { return WriteJsonFile(kStagingFile, value); }

void ZAM::TransJsonToVar(Json::Value& value) {
  Settings& s = *settings_;
  const Json::Value& port = Member(value, "port");
  if (port.isInt()) s.http_port = static_cast<unsigned short>(port.asInt());

  const Json::Value& ssl = Member(value, "ssl");
  if (ssl.isObject()) {
    TakeBool(ssl, "spdy", &s.spdy);
    TakeBool(ssl, "redirect", &s.https_redirect);
    const Json::Value& ssl_port = Member(ssl, "port");
    if (ssl_port.isInt() && ssl_port.asInt() >= 1 && ssl_port.asInt() <= 65535) {
      s.https_port = static_cast<unsigned short>(ssl_port.asInt());
    }
    TakePath(ssl, "certificate", &s.certificate);
    TakePath(ssl, "key", &s.key);
  }

  TakeBool(value, "directAccess", &s.access_default_port);

  const Json::Value& fqdn = Member(value, "fqdn");
  if (fqdn.isString()) {
    s.fqdn = fqdn.asString();
    if (!Validator::IsSerNameValid(s.fqdn)) {
      TAVOW3_LOG_ERR("FQDN %s is not legal", s.fqdn.c_str());
      s.fqdn.clear();
    }
  }

  const Json::Value& https = Member(value, "https");
  if (https.isObject()) {
    TakeBool(https, "compression", &s.http_compression);
    TakeBool(https, "hsts", &s.hsts);
    TakeBool(https, "http2", &s.http2);
  }

  const Json::Value& max_connections = Member(value, "max_connections");
  if (max_connections.isInt()) {
    s.customized_max_connections = true;
    s.max_connections = CorrectMaxConnections(max_connections.asInt());
  }

  if (value.isObject() && value.isMember("server_tag")) {
    const Json::Value& tag = value["server_tag"];
    s.server_header = tag.isString() ? tag.asString() : std::string();
  }

  s.trust_proxies.clear();
  const Json::Value& proxies = Member(value, "trust_proxy");
  if (proxies.isArray()) {
    for (const Json::Value& proxy : proxies) {
      if (proxy.isString()) s.trust_proxies.push_back(proxy.asString());
    }
  }
}

bool ZAM::TransVarToJson(Json::Value& value) {
  const Settings& s = *settings_;
  value["version"] = kSettingsVersion;
  value["port"] = s.http_port;
  Json::Value& ssl = value["ssl"];
  ssl["port"] = s.https_port;
  ssl["spdy"] = s.spdy;
  ssl["redirect"] = s.https_redirect;
  ssl["certificate"] = s.certificate;
  ssl["key"] = s.key;
  value["directAccess"] = s.access_default_port;
  value["fqdn"] = StringOrNull(s.fqdn);
  Json::Value& https = value["https"];
  https["compression"] = s.http_compression;
  https["hsts"] = s.hsts;
  value["max_connections"] =
      s.customized_max_connections ? Json::Value(s.max_connections) : Json::Value();
  value["server_tag"] = StringOrNull(s.server_header);
  if (s.trust_proxies.empty()) {
    value["trust_proxy"] = Json::Value();
  } else {
    Json::Value& proxies = value["trust_proxy"] = Json::Value(Json::arrayValue);
    for (const std::string& proxy : s.trust_proxies) proxies.append(proxy);
  }
  return true;
}

}  // namespace tavow3
