#include "settings.h"

#include <json/reader.h>

#include <fstream>

#include "certificate.h"
#include "files.h"

namespace tavonginxgen {
namespace {

constexpr char kStagedWWWService[] = "/var/tmp/nginx/WWWService.json";
constexpr char kStoredWWWService[] = "/usr/tavo/etc/www/WWWService.json";
// The appliance's system certificate, where the web service points by
// default; until one is installed the self-signed one serves instead.
constexpr char kSystemCertificate[] = "/usr/tavo/etc/ssl/ssl.chain.crt/server.crt";
constexpr char kSystemKey[] = "/usr/tavo/etc/ssl/ssl.key/server.key";

// The JSON object in `path`, or null when it is missing or not an object.
Json::Value ReadObject(const std::string& path) {
  std::ifstream in(path);
  Json::Value value;
  if (!in || !Json::Reader().parse(in, value, false) || !value.isObject()) return Json::Value();
  return value;
}

unsigned short PortOf(const Json::Value& value) {
  return value.isInt() && value.asInt() > 0 && value.asInt() < 65536
             ? static_cast<unsigned short>(value.asInt())
             : 0;
}

std::string StringOr(const Json::Value& value, const std::string& fallback) {
  return value.isString() && !value.asString().empty() ? value.asString() : fallback;
}

// Reads the web service's settings with the library's rules: the HTTPS port
// counts only beside an "ssl" object.
AdditionalPorts LoadAdditionalPorts() {
  const Json::Value www = ReadObject(FileExists(kStagedWWWService) ? kStagedWWWService
                                                                   : kStoredWWWService);
  AdditionalPorts ports;
  const Json::Value& additional = www["additionalPort"];
  if (additional.isObject()) ports.http_port = PortOf(additional["http"]);
  const Json::Value& ssl = www["ssl"];
  if (!ssl.isObject()) return ports;
  if (additional.isObject()) ports.https_port = PortOf(additional["https"]);
  ports.certificate = StringOr(ssl["certificate"], kSystemCertificate);
  ports.key = StringOr(ssl["key"], kSystemKey);
  if (ports.certificate == kSystemCertificate && ports.key == kSystemKey &&
      !(FileExists(kSystemCertificate) && FileExists(kSystemKey))) {
    ports.certificate = kCertificatePath;
    ports.key = kKeyPath;
  }
  ports.http2 = ssl["spdy"].isBool() && ssl["spdy"].asBool();
  ports.hsts = ssl["hsts"].isBool() && ssl["hsts"].asBool();
  return ports;
}

}  // namespace

Settings LoadSettings() {
  Settings settings;
  settings.additional = LoadAdditionalPorts();
  return settings;
}

Json::Value TemplateContext(const Settings& settings) {
  Json::Value context(Json::objectValue);
  context["management"]["http_port"] = settings.management_http_port;
  context["management"]["https_port"] = settings.management_https_port;
  context["certificate"]["crt"] = kCertificatePath;
  context["certificate"]["key"] = kKeyPath;
  Json::Value& ports = context["web_ports"] = Json::Value(Json::arrayValue);
  for (const WebPort& web : settings.web_ports) {
    Json::Value port(Json::objectValue);
    port["port"] = web.port;
    port["https"] = web.https;
    ports.append(port);
  }
  const AdditionalPorts& additional = settings.additional;
  if (additional.http_port != 0) context["additional_http"]["port"] = additional.http_port;
  if (additional.https_port != 0) {
    Json::Value& https = context["additional_https"];
    https["port"] = additional.https_port;
    https["crt"] = additional.certificate;
    https["key"] = additional.key;
    https["http2"] = additional.http2;
    https["hsts"] = additional.hsts;
  }
  return context;
}

}  // namespace tavonginxgen
