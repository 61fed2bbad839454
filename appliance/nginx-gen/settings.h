// What the generated nginx configuration serves, and the one place it is read.
#ifndef TAVO_APPLIANCE_NGINX_GEN_SETTINGS_H_
#define TAVO_APPLIANCE_NGINX_GEN_SETTINGS_H_

#include <json/value.h>

#include <string>
#include <vector>

namespace tavonginxgen {

// One listening port of the general web service.
struct WebPort {
  unsigned short port;
  bool https;
};

struct Settings {
  // The management interface, served from the main configuration itself so
  // that it survives the Abnormal mode.
  unsigned short management_http_port = 5000;
  unsigned short management_https_port = 5001;
  // The general web service (a site under sites-enabled).
  std::vector<WebPort> web_ports = {{80, false}, {443, true}};
};

// The settings the configuration is generated from. Every input of the
// generator is read here and nowhere else; today these are the appliance's
// built-in ports.
Settings LoadSettings();

// The templates' context: "management" {http_port, https_port},
// "certificate" {crt, key}, "web_ports" [{port, https}].
Json::Value TemplateContext(const Settings& settings);

}  // namespace tavonginxgen

#endif  // TAVO_APPLIANCE_NGINX_GEN_SETTINGS_H_
