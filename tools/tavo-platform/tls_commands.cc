// tls-list and tls-level: the TLS-profile framework's data store.
#include <json/value.h>
#include <tavo/tavotls.h>

#include <climits>
#include <cstdio>
#include <string>

#include "commands.h"

namespace tavo_platform {

int TlsList(const Args& args) {
  if (!args.empty()) return UsageError("tls-list takes no arguments");
  Json::Value services = tavotls::DataStoreProvider::list_services();
  if (!services.isObject() || services.empty()) {
    std::printf("no services\n");
    return kSuccess;
  }
  for (const std::string& name : services.getMemberNames()) {
    const Json::Value& service = services[name];
    const Json::Value& level = service["level"];
    const Json::Value& display = service["display-name"];
    std::printf("%-24s level %s  %s\n", name.c_str(),
                level.isInt() ? std::to_string(level.asInt()).c_str() : "?",
                display.isString() ? display.asCString() : "");
  }
  return kSuccess;
}

int TlsLevel(const Args& args) {
  if (args.empty() || args.size() > 2) return UsageError("tls-level needs SERVICE [LEVEL]");
  const std::string& service = args[0];
  if (args.size() == 2) {
    int level = 0;
    if (!ParseCount(args[1], INT_MAX / 10, &level)) {
      return UsageError("level \"" + args[1] + "\" is not a number");
    }
    if (tavotls::DataStoreProvider::set_service_level(service, level) != 0) {
      std::fprintf(stderr, "tavo-platform: cannot set the level of %s to %d\n", service.c_str(),
                   level);
      return kFailed;
    }
  }
  int level = tavotls::DataStoreProvider::get_service_level(service);
  if (level < 0) {
    std::printf("%s: not registered\n", service.c_str());
    return kNo;
  }
  std::printf("%s: level %d\n", service.c_str(), level);
  return kSuccess;
}

}  // namespace tavo_platform
