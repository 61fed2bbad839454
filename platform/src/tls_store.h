// The TLS-profile data store: one JSON file {"services": {name: entry}}
// replaced atomically, changes serialised between processes and threads by
// an exclusive flock on its lock file. An entry is
// {"display-name": string, "display-name-i18n": string, "level": 1..3}.
#ifndef TAVO_PLATFORM_TLS_STORE_H_
#define TAVO_PLATFORM_TLS_STORE_H_

#include <json/value.h>

#include <functional>

// Internal to the library: not exported.
#pragma GCC visibility push(hidden)

namespace tavo::internal {

constexpr int kTlsMinLevel = 1;
constexpr int kTlsMaxLevel = 3;
constexpr int kTlsDefaultLevel = 2;

// Reads the services of the store into *services. A store that does not
// exist yet gives the defaults. False when the store cannot be read or does
// not have the shape above; *services is unchanged then.
bool LoadTlsServices(Json::Value* services);

// Under the lock: loads the services, lets `change` edit them and stores
// them when it returns true. False when the lock, the load, `change` or the
// store fails; the stored file is unchanged then.
bool ChangeTlsServices(const std::function<bool(Json::Value* services)>& change);

// A store entry.
Json::Value TlsServiceEntry(const Json::Value& display_name, const Json::Value& display_name_i18n,
                            int level);

}  // namespace tavo::internal

#pragma GCC visibility pop

#endif  // TAVO_PLATFORM_TLS_STORE_H_
