#include "tavo/tavotls.h"

#include <exception>

#include "tls_store.h"

namespace tavotls {
namespace {

using tavo::internal::ChangeTlsServices;
using tavo::internal::kTlsDefaultLevel;
using tavo::internal::kTlsMaxLevel;
using tavo::internal::kTlsMinLevel;
using tavo::internal::LoadTlsServices;
using tavo::internal::TlsServiceEntry;

bool IsServiceName(const Json::Value& name) { return name.isString() && !name.asString().empty(); }

// The array "services" of a framework document whose every element is an
// object naming a service; with `need_names` each must also carry a string
// "display-name" and, when present, a string "display-name-i18n".
bool IsServiceList(const Json::Value& document, bool need_names) {
  if (!document.isObject() || !document["services"].isArray()) return false;
  for (const Json::Value& item : document["services"]) {
    if (!item.isObject() || !IsServiceName(item["service"])) return false;
    if (need_names && (!item["display-name"].isString() ||
                       (item.isMember("display-name-i18n") && !item["display-name-i18n"].isString()))) {
      return false;
    }
  }
  return true;
}

}  // namespace

int APIProvider::join_framework(const Json::Value& document) {
  try {
    if (!IsServiceList(document, /*need_names=*/true)) return -1;
    bool ok = ChangeTlsServices([&document](Json::Value* services) {
      for (const Json::Value& item : document["services"]) {
        const std::string name = item["service"].asString();
        int level = services->isMember(name) ? (*services)[name]["level"].asInt() : kTlsDefaultLevel;
        (*services)[name] =
            TlsServiceEntry(item["display-name"], item.get("display-name-i18n", ""), level);
      }
      return true;
    });
    return ok ? 0 : -1;
  } catch (const std::exception&) {
    return -1;
  }
}

int APIProvider::leave_framework(const Json::Value& document) {
  try {
    if (!IsServiceList(document, /*need_names=*/false)) return -1;
    bool ok = ChangeTlsServices([&document](Json::Value* services) {
      for (const Json::Value& item : document["services"]) services->removeMember(item["service"].asString());
      return true;
    });
    return ok ? 0 : -1;
  } catch (const std::exception&) {
    return -1;
  }
}

Json::Value DataStoreProvider::list_services() {
  Json::Value services;
  try {
    if (LoadTlsServices(&services)) return services;
  } catch (const std::exception&) {
    // An unreadable store lists nothing, as a malformed one does.
  }
  return Json::Value(Json::objectValue);
}

int DataStoreProvider::get_service_level(const std::string& service) {
  try {
    Json::Value services;
    if (!LoadTlsServices(&services) || !services.isMember(service)) return -1;
    return services[service]["level"].asInt();
  } catch (const std::exception&) {
    return -1;
  }
}

int DataStoreProvider::set_service_level(const std::string& service, int level) {
  if (service.empty() || level < kTlsMinLevel || level > kTlsMaxLevel) return -1;
  try {
    bool ok = ChangeTlsServices([&service, level](Json::Value* services) {
      if (services->isMember(service)) {
        (*services)[service]["level"] = level;
      } else {
        (*services)[service] = TlsServiceEntry(service, "", level);
      }
      return true;
    });
    return ok ? 0 : -1;
  } catch (const std::exception&) {
    return -1;
  }
}

}  // namespace tavotls
