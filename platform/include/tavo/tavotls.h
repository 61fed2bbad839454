// TLS-profile framework: the services that take part in the appliance's TLS
// profiles and their service levels, kept in one JSON data store
// "/usr/tavo/etc/tls/services.json" that is replaced atomically. A store that
// does not exist yet holds the system's own services at their default level:
// the management interface "zam" (display name "ZAM") at level 2. Changes are
// serialised between processes and threads by an exclusive flock on
// "/run/lock/tavotls.lock"; readers take no lock and see the old or the new
// store. A store that exists but is not a valid store is never overwritten:
// reads find nothing and changes fail.
#ifndef TAVO_TAVOTLS_H_
#define TAVO_TAVOTLS_H_

#include <json/value.h>

#include <string>

namespace tavotls {

class APIProvider {
 public:
  // Adds or updates the services of `document`, an object with an array
  // "services" of objects with "service", "display-name" and optionally
  // "display-name-i18n" ("system-service" is accepted and ignored). A
  // service joins at level 2 and keeps its level when it is already there.
  // Returns 0 on success, -1 on a malformed document or a store failure.
  static int join_framework(const Json::Value& document);
  // Removes the services named by "service" in the objects of the array
  // "services" of `document` (other keys are ignored). Returns 0 on success,
  // also when they were not there; -1 on a malformed document or a store
  // failure.
  static int leave_framework(const Json::Value& document);
};

class DataStoreProvider {
 public:
  // An object with one member per registered service, named by the service,
  // holding {"display-name": ..., "display-name-i18n": ..., "level": n}.
  // An unreadable store gives an empty object.
  static Json::Value list_services();
  // The level of `service`, or -1 when it is not registered or the store
  // cannot be read.
  static int get_service_level(const std::string& service);
  // Sets the level (1 to 3) of `service`, registering it (with its name as the
  // display name) when missing. Returns 0 on success, -1 for an empty name, a
  // level out of range or a store failure.
  static int set_service_level(const std::string& service, int level);
};

}  // namespace tavotls

#endif  // TAVO_TAVOTLS_H_
