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

// The management interface, from its settings file. Texts are checked here
// so that the templates may insert them as they are.
struct Management {
  unsigned short http_port = 5000;
  unsigned short https_port = 5001;
  std::string certificate;  // quoted for nginx
  std::string key;          // quoted for nginx
  bool https_redirect = false;
  bool http2 = false;  // the SPDY setting: nginx speaks HTTP/2 instead
  bool hsts = false;
  bool compression = false;
  std::string server_name;    // the custom domain; "" for none or one nginx cannot take
  std::string server_header;  // quoted "Server: name"; "" to send none
  int worker_connections = 1024;
  std::vector<std::string> trusted_proxies;  // addresses and ranges only
};

struct Settings {
  // The management interface, served from the main configuration itself so
  // that it survives the Abnormal mode.
  Management management;
  // The module that sets and clears response headers: "" when nginx loads it
  // through /etc/nginx/modules-enabled or it is not installed, else its path.
  std::string headers_more_module;
  bool has_headers_more = false;
  // The general web service (a site under sites-enabled).
  std::vector<WebPort> web_ports = {{80, false}, {443, true}};
  AdditionalPorts additional;
};

// The settings the configuration is generated from. Every input of the
// generator is read here and nowhere else: for the management interface and
// the general web service each, the staged settings under "/var/tmp/nginx"
// ("ZAM.json", "WWWService.json") when present (a save in progress), else the
// stored ones under "/usr/tavo/etc/www". A missing or unreadable file leaves
// the built-in values.
Settings LoadSettings();

// The templates' context: "management" {http_port, https_port, crt, key,
// https_redirect, http2, hsts, compression, server_name, server_header,
// clear_server_header, worker_connections, trusted_proxies [address]},
// "headers_more_module", "certificate" {crt, key}, "web_ports" [{port, https}], and, only for the
// additional ports that are set, "additional_http" {port} and
// "additional_https" {port, crt, key, http2, hsts}.
Json::Value TemplateContext(const Settings& settings);

}  // namespace tavonginxgen

#endif  // TAVO_APPLIANCE_NGINX_GEN_SETTINGS_H_
