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

// The general web service's additional ports, from its settings file.
struct AdditionalPorts {
  unsigned short http_port = 0;   // 0: none
  unsigned short https_port = 0;  // 0: none
  std::string certificate;        // of the HTTPS port
  std::string key;
  bool http2 = false;             // the SPDY setting: nginx speaks HTTP/2 instead
  bool hsts = false;
};

struct Settings {
  // The management interface, served from the main configuration itself so
  // that it survives the Abnormal mode.
  unsigned short management_http_port = 5000;
  unsigned short management_https_port = 5001;
  // The general web service (a site under sites-enabled).
  std::vector<WebPort> web_ports = {{80, false}, {443, true}};
  AdditionalPorts additional;
};

// The settings the configuration is generated from. Every input of the
// generator is read here and nowhere else: the general web service's staged
// settings "/var/tmp/nginx/WWWService.json" when present (a save in
// progress), else its stored "/usr/tavo/etc/www/WWWService.json". A missing
// or unreadable file leaves the built-in values.
Settings LoadSettings();

// The templates' context: "management" {http_port, https_port},
// "certificate" {crt, key}, "web_ports" [{port, https}], and, only for the
// additional ports that are set, "additional_http" {port} and
// "additional_https" {port, crt, key, http2, hsts}.
Json::Value TemplateContext(const Settings& settings);

}  // namespace tavonginxgen

#endif  // TAVO_APPLIANCE_NGINX_GEN_SETTINGS_H_
