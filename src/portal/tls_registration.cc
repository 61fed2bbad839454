#include <tavow3/tls_registration.h>

#include <json/value.h>
#include <json/writer.h>
#include <sys/stat.h>

#include <tavo/tavofs.h>
#include <tavo/tavotls.h>
#include <tavo/tlib_exec.h>

#include "base/file_io.h"

namespace tavow3 {
namespace {

constexpr char kCertificateServiceDir[] = "/usr/tavo/share/certificate.d";
constexpr char kCertificateDir[] = "/usr/tavo/etc/certificate";
constexpr char kRegisterTool[] = "/usr/tavo/bin/tavocrtregister";
constexpr char kUnregisterTool[] = "/usr/tavo/bin/tavocrtunregister";
constexpr base::FileMode kServiceFileMode = {1, 1, 0644};

std::string JoinedName(const std::string& subscriber, const std::string& service) {
  return subscriber + "_" + service;
}

// The TLS framework's document: hyphenated keys, joined service name.
Json::Value TLSDocument(const std::string& joined_name, const std::string& display_name,
                        const std::string& display_name_i18n) {
  Json::Value entry(Json::objectValue);
  entry["service"] = joined_name;
  entry["display-name"] = display_name;
  if (!display_name_i18n.empty()) entry["display-name-i18n"] = display_name_i18n;
  Json::Value document(Json::objectValue);
  document["system-service"] = false;
  document["services"] = Json::Value(Json::arrayValue);
  document["services"].append(entry);
  return document;
}

// The certificate store's document: underscored keys, bare service name.
Json::Value CertificateDocument(const std::string& service, const std::string& display_name,
                                const std::string& display_name_i18n) {
  Json::Value entry(Json::objectValue);
  entry["display_name"] = display_name;
  entry["service"] = service;
  if (!display_name_i18n.empty()) entry["display_name_i18n"] = display_name_i18n;
  Json::Value document(Json::objectValue);
  document["services"] = Json::Value(Json::arrayValue);
  document["services"].append(entry);
  document["owner"] = "root";
  document["isPkg"] = false;
  return document;
}

std::string StyledJson(const Json::Value& document) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "   ";
  return Json::writeString(builder, document) + "\n";
}

bool IsDirectory(const std::string& path) {
  struct stat st;
  return base::Stat(path, &st) && S_ISDIR(st.st_mode);
}

}  // namespace

bool RegisterTLSProfile(const std::string& subscriber, const std::string& service,
                        const std::string& display_name, const std::string& display_name_i18n) {
  const Json::Value document =
      TLSDocument(JoinedName(subscriber, service), display_name, display_name_i18n);
  return tavotls::APIProvider::join_framework(document) == 0;
}

bool UnregisterTLSProfile(const std::string& subscriber, const std::string& service) {
  const std::string joined_name = JoinedName(subscriber, service);
  const Json::Value registered = tavotls::DataStoreProvider::list_services();
  if (!registered.isObject() || !registered.isMember(joined_name)) return true;
  return tavotls::APIProvider::leave_framework(TLSDocument(joined_name, "", "")) == 0;
}

bool RegisterCertificate(const std::string& subscriber, const std::string& service,
                         const std::string& display_name, const std::string& display_name_i18n) {
  const std::string path = std::string(kCertificateServiceDir) + "/" + subscriber + ".cfg";
  // The tool runs even without its file: it reports for itself what it lacks.
  (void)TAVOFSMkdirP(kCertificateServiceDir, 0, 0755);
  (void)base::ReplaceFile(
      path, StyledJson(CertificateDocument(service, display_name, display_name_i18n)),
      kServiceFileMode);
  return TLIBCExec(kRegisterTool, subscriber.c_str(), service.c_str()) == 0;
}

bool UnregisterCertificate(const std::string& subscriber, const std::string& service) {
  if (!IsDirectory(std::string(kCertificateDir) + "/" + subscriber + "/" + service)) return true;
  return TLIBCExec(kUnregisterTool, subscriber.c_str(), service.c_str()) == 0;
}

std::string AppPortalTLSFQDNServiceName(const std::string& name) { return name; }

std::string AppPortalTLSAltPortServiceName(const std::string& name) { return name + "_AltPort"; }

std::string AppPortalTLSDesc(const std::string& name, const std::string& text) {
  return name + " - " + text;
}

std::string AppPortalTLSDesc(const std::string& name, const int& port) {
  return name + " - " + std::to_string(port);
}

}  // namespace tavow3
