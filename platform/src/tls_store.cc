#include "tls_store.h"

#include <fcntl.h>
#include <sys/file.h>

#include <cerrno>
#include <memory>
#include <sstream>
#include <string>

#include <json/reader.h>
#include <json/writer.h>

#include "file_util.h"
#include "tavo/tavofs.h"

namespace tavo::internal {
namespace {

constexpr char kStoreDir[] = "/usr/tavo/etc/tls";
constexpr char kStorePath[] = "/usr/tavo/etc/tls/services.json";
constexpr char kLockDir[] = "/run/lock";
constexpr char kLockPath[] = "/run/lock/tavotls.lock";

bool IsEntry(const Json::Value& entry) {
  return entry.isObject() && entry["display-name"].isString() &&
         entry["display-name-i18n"].isString() && entry["level"].isInt() &&
         entry["level"].asInt() >= kTlsMinLevel && entry["level"].asInt() <= kTlsMaxLevel;
}

bool ParseStore(const std::string& text, Json::Value* services) {
  Json::CharReaderBuilder builder;
  std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  Json::Value root;
  std::string errors;
  if (!reader->parse(text.data(), text.data() + text.size(), &root, &errors) || !root.isObject() ||
      !root["services"].isObject()) {
    return false;
  }
  const Json::Value& stored = root["services"];
  for (const std::string& name : stored.getMemberNames()) {
    if (name.empty() || !IsEntry(stored[name])) return false;
  }
  *services = stored;
  return true;
}

bool StoreServices(const Json::Value& services) {
  Json::Value root(Json::objectValue);
  root["services"] = services;
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "  ";
  std::string text = Json::writeString(builder, root) + "\n";
  return TAVOFSMkdirP(kStoreDir, 0, 0755) == 0 && ReplaceFileWithBytes(kStorePath, text, 0644);
}

// Takes the store's exclusive lock for its lifetime.
UniqueFd LockStore() {
  if (TAVOFSMkdirP(kLockDir, 0, 0755) != 0) return UniqueFd();
  UniqueFd fd = Open(kLockPath, O_RDWR | O_CREAT | O_NOCTTY, 0644);
  if (!fd.valid()) return fd;
  int rc;
  do {
    rc = ::flock(fd.get(), LOCK_EX);
  } while (rc != 0 && errno == EINTR);
  return rc == 0 ? std::move(fd) : UniqueFd();
}

}  // namespace

Json::Value TlsServiceEntry(const Json::Value& display_name, const Json::Value& display_name_i18n,
                            int level) {
  Json::Value entry(Json::objectValue);
  entry["display-name"] = display_name;
  entry["display-name-i18n"] = display_name_i18n;
  entry["level"] = level;
  return entry;
}

bool LoadTlsServices(Json::Value* services) {
  std::string text;
  if (!ReadFile(kStorePath, &text)) {
    if (errno != ENOENT) return false;
    Json::Value defaults(Json::objectValue);
    defaults["zam"] = TlsServiceEntry("ZAM", "", kTlsDefaultLevel);
    *services = defaults;
    return true;
  }
  return ParseStore(text, services);
}

bool ChangeTlsServices(const std::function<bool(Json::Value* services)>& change) {
  UniqueFd lock = LockStore();
  Json::Value services;
  return lock.valid() && LoadTlsServices(&services) && change(&services) &&
         StoreServices(services);
}

}  // namespace tavo::internal
