#include "settings.h"

#include "certificate.h"

namespace tavonginxgen {

Settings LoadSettings() { return Settings(); }

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
  return context;
}

}  // namespace tavonginxgen
