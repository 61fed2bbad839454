#include "engine/crt_sync.h"

#include <json/value.h>
#include <json/writer.h>

#include <string>

#include <tavo/tavofs.h>
#include <tavo/tavotls.h>
#include <tavo/tlib_exec.h>

#include "base/file_io.h"
#include "base/log.h"

namespace tavow3 {
namespace {

constexpr char kLogTag[] = "engine_v2";

constexpr char kCertificateDir[] = "/usr/tavo/share/certificate.d";
constexpr char kRegisterTool[] = "/usr/tavo/bin/tavocrtregister";
constexpr base::FileMode kDocumentMode = {1, 1, 0644};

std::string StyledJson(const Json::Value& document) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "   ";
  return Json::writeString(builder, document) + "\n";
}

// The service entries of each subscriber, keyed by subscriber.
Json::Value ServicesBySubscriber(const EngineV2::Security& security) {
  Json::Value by_subscriber(Json::objectValue);
  for (const auto& [key, crt] : security.crt_resources) {
    Json::Value entry(Json::objectValue);
    entry["service"] = crt.service;
    entry["display_name"] = crt.display_name;
    entry["display_name_i18n"] = crt.display_name_i18n;
    Json::Value& services = by_subscriber[key.first];
    if (services.isNull()) services = Json::Value(Json::arrayValue);
    services.append(entry);
  }
  return by_subscriber;
}

// Writes the subscriber's certificate document and runs the registration
// tool. The tool's exit status decides: a document that cannot be written
// does not keep the tool from running, which reports for itself what it lacks.
bool RegisterSubscriber(const std::string& subscriber, const Json::Value& services,
                        bool is_package) {
  Json::Value document(Json::objectValue);
  document["owner"] = "root";
  document["services"] = services;
  document["isPkg"] = is_package;
  const std::string path = std::string(kCertificateDir) + "/" + subscriber + ".cfg";
  (void)base::ReplaceFile(path, StyledJson(document), kDocumentMode);
  if (TLIBCExec(kRegisterTool, subscriber.c_str()) != 0) {
    TAVOW3_LOG_ERR_AT(92, "Faid to register certificate for subscriber %s", subscriber.c_str());
    return false;
  }
  return true;
}

}  // namespace

Json::Value TlsServiceDocument(const EngineV2::Security& security) {
  Json::Value services(Json::arrayValue);
  for (const auto& [key, crt] : security.crt_resources) {
    Json::Value entry(Json::objectValue);
    entry["service"] = key.first + "_" + key.second;
    entry["display-name"] = crt.display_name;
    if (!crt.display_name_i18n.empty()) entry["display-name-i18n"] = crt.display_name_i18n;
    services.append(entry);
  }
  Json::Value document(Json::objectValue);
  document["system-service"] = false;
  document["services"] = services;
  return document;
}

bool SyncCertificates(const EngineV2::Security& security) {
  const Json::Value by_subscriber = ServicesBySubscriber(security);
  // The directory belongs to the certificate service; made here only so that
  // a fresh appliance can take the documents.
  if (!by_subscriber.empty()) (void)TAVOFSMkdirP(kCertificateDir, 0, 0755);
  bool all_registered = true;
  for (const std::string& subscriber : by_subscriber.getMemberNames()) {
    const bool is_package = security.package_subscribers.count(subscriber) != 0;
    if (!RegisterSubscriber(subscriber, by_subscriber[subscriber], is_package)) {
      all_registered = false;
    }
  }
  if (!all_registered) return false;
  return tavotls::APIProvider::join_framework(TlsServiceDocument(security)) == 0;
}

}  // namespace tavow3
