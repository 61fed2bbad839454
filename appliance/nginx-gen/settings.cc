#include "settings.h"

#include <json/reader.h>
#include <sys/sysinfo.h>

#include <algorithm>
#include <fstream>

#include "certificate.h"
#include "files.h"

namespace tavonginxgen {
namespace {

constexpr char kStagedZAM[] = "/var/tmp/nginx/ZAM.json";
constexpr char kStoredZAM[] = "/usr/tavo/etc/www/ZAM.json";
constexpr char kStagedWWWService[] = "/var/tmp/nginx/WWWService.json";
constexpr char kStoredWWWService[] = "/usr/tavo/etc/www/WWWService.json";
// The appliance's system certificate, where the web service points by
// default; until one is installed the self-signed one serves instead.
constexpr char kSystemCertificate[] = "/usr/tavo/etc/ssl/ssl.chain.crt/server.crt";
constexpr char kSystemKey[] = "/usr/tavo/etc/ssl/ssl.key/server.key";
// Debian's headers-more module and the file through which nginx loads it.
constexpr char kHeadersMoreEnabled[] =
    "/etc/nginx/modules-enabled/50-mod-http-headers-more-filter.conf";
constexpr char kHeadersMoreModule[] =
    "/usr/lib/nginx/modules/ngx_http_headers_more_filter_module.so";
// The per-worker connection settings that bound the management interface's
// total, as the library computes them.
constexpr int kLowerWorkerConnections = 1024;
constexpr int kUpperWorkerConnections = 65535;

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

bool BoolOf(const Json::Value& value) { return value.isBool() && value.asBool(); }

// The certificate and key of an "ssl" object; the system's pair, while it is
// not installed, gives way to the self-signed one.
void CertificateOf(const Json::Value& ssl, std::string* certificate, std::string* key) {
  *certificate = StringOr(ssl["certificate"], kSystemCertificate);
  *key = StringOr(ssl["key"], kSystemKey);
  if (*certificate == kSystemCertificate && *key == kSystemKey &&
      !(FileExists(kSystemCertificate) && FileExists(kSystemKey))) {
    *certificate = kCertificatePath;
    *key = kKeyPath;
  }
}

// True when `text` is not empty and holds only characters of `allowed`.
bool OnlyOf(const std::string& text, const char* allowed) {
  return !text.empty() && text.find_first_not_of(allowed) == std::string::npos;
}

// `text` as one double-quoted nginx argument: nothing in it can end the
// argument or the directive.
std::string Quoted(const std::string& text) {
  std::string quoted = "\"";
  for (char c : text) {
    if (c == '"' || c == '\\') quoted += '\\';
    quoted += c;
  }
  return quoted + "\"";
}

// The per-worker connection setting for the stored total: the total is
// clamped to what 1024 to 65535 connections per worker give on this
// machine's processors; without one the lower limit applies.
int WorkerConnections(const Json::Value& max_connections) {
  const int processors = std::max(1, get_nprocs());
  const int lower = processors * kLowerWorkerConnections / 2;
  const int upper = processors * kUpperWorkerConnections / 2;
  const int total =
      max_connections.isInt() ? std::min(std::max(max_connections.asInt(), lower), upper) : lower;
  return 2 * total / processors;
}

// The "Server" header's directive argument: "nginx" unless the file says
// otherwise; "" (no header) for an empty or unusable name.
std::string ServerHeaderOf(const Json::Value& zam) {
  if (!zam.isMember("server_tag")) return Quoted("Server: nginx");
  const Json::Value& tag = zam["server_tag"];
  constexpr char kNameCharacters[] =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789 ._-/()+";
  if (!tag.isString() || !OnlyOf(tag.asString(), kNameCharacters)) return "";
  return Quoted("Server: " + tag.asString());
}

// Reads the management interface's settings with the library's rules; ports
// out of range keep their defaults.
Management LoadManagement() {
  const Json::Value zam = ReadObject(FileExists(kStagedZAM) ? kStagedZAM : kStoredZAM);
  Management management;
  if (const unsigned short port = PortOf(zam["port"])) management.http_port = port;
  const Json::Value& ssl = zam["ssl"].isObject() ? zam["ssl"] : Json::Value::nullSingleton();
  if (const unsigned short port = PortOf(ssl["port"])) management.https_port = port;
  std::string certificate;
  std::string key;
  CertificateOf(ssl, &certificate, &key);
  management.certificate = Quoted(certificate);
  management.key = Quoted(key);
  management.https_redirect = BoolOf(ssl["redirect"]);
  management.http2 = BoolOf(ssl["spdy"]);
  const Json::Value& https = zam["https"];
  management.hsts = BoolOf(https["hsts"]);
  management.compression = BoolOf(https["compression"]);
  // Internationalised names would need their ASCII form: they are left out,
  // and the interface still answers as the ports' default server.
  const Json::Value& fqdn = zam["fqdn"];
  constexpr char kHostCharacters[] =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789.-";
  if (fqdn.isString() && OnlyOf(fqdn.asString(), kHostCharacters)) {
    management.server_name = fqdn.asString();
  }
  management.server_header = ServerHeaderOf(zam);
  management.worker_connections = WorkerConnections(zam["max_connections"]);
  const Json::Value& proxies = zam["trust_proxy"];
  if (proxies.isArray()) {
    for (const Json::Value& proxy : proxies) {
      if (proxy.isString() && OnlyOf(proxy.asString(), "0123456789abcdefABCDEF:./")) {
        management.trusted_proxies.push_back(proxy.asString());
      }
    }
  }
  return management;
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
  CertificateOf(ssl, &ports.certificate, &ports.key);
  ports.http2 = ssl["spdy"].isBool() && ssl["spdy"].asBool();
  ports.hsts = ssl["hsts"].isBool() && ssl["hsts"].asBool();
  return ports;
}

Json::Value ManagementContext(const Settings& settings) {
  const Management& management = settings.management;
  Json::Value context(Json::objectValue);
  context["http_port"] = management.http_port;
  context["https_port"] = management.https_port;
  context["crt"] = management.certificate;
  context["key"] = management.key;
  context["https_redirect"] = management.https_redirect;
  context["http2"] = management.http2;
  context["hsts"] = management.hsts;
  context["compression"] = management.compression;
  if (!management.server_name.empty()) context["server_name"] = management.server_name;
  // Without the headers-more module nginx sends its own header.
  if (settings.has_headers_more && !management.server_header.empty()) {
    context["server_header"] = management.server_header;
  }
  context["clear_server_header"] = settings.has_headers_more && management.server_header.empty();
  context["worker_connections"] = management.worker_connections;
  context["has_trusted_proxies"] = !management.trusted_proxies.empty();
  Json::Value& proxies = context["trusted_proxies"] = Json::Value(Json::arrayValue);
  for (const std::string& proxy : management.trusted_proxies) proxies.append(proxy);
  return context;
}

}  // namespace

Settings LoadSettings() {
  Settings settings;
  settings.management = LoadManagement();
  settings.has_headers_more = FileExists(kHeadersMoreEnabled) || FileExists(kHeadersMoreModule);
  if (!FileExists(kHeadersMoreEnabled) && FileExists(kHeadersMoreModule)) {
    settings.headers_more_module = kHeadersMoreModule;
  }
  settings.additional = LoadAdditionalPorts();
  return settings;
}

Json::Value TemplateContext(const Settings& settings) {
  Json::Value context(Json::objectValue);
  context["management"] = ManagementContext(settings);
  if (!settings.headers_more_module.empty()) {
    context["headers_more_module"] = settings.headers_more_module;
  }
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
