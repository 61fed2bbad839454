// The rule by which a port setter takes the port of a PortValidator.
#ifndef TAVOW3_SRC_PORTAL_APPLY_PORT_VALIDATOR_H_
#define TAVOW3_SRC_PORTAL_APPLY_PORT_VALIDATOR_H_

#include <tavow3/engine.h>
#include <tavow3/port_validator.h>
#include <tavow3/resource.h>

#include "base/export.h"

namespace tavow3 {

// What ApplyPortValidator did with the requested port.
enum class PortChange {
  kUnchanged,  // the port was already stored: nothing touched
  kRefused,    // port 0, or the engine refused it: nothing touched
  kChanged,    // registered, old port dropped, *port updated: mark the object dirty
};

// Moves the engine registration of a setter's port from *port to the port of
// `requested`. `resource` describes the port resource (section, texts, owner,
// schema, host name); its port member is ignored. The new resource is
// registered first, so a refusal changes nothing; only then is the old
// (host name, *port) resource dropped, when *port was not 0. Same threads as
// `engine`.
[[nodiscard]] TAVOW3_INTERNAL PortChange ApplyPortValidator(Engine& engine,
                                                            const PortValidator& requested,
                                                            FQDNPortSchemaResource resource,
                                                            unsigned short* port);

}  // namespace tavow3

#endif  // TAVOW3_SRC_PORTAL_APPLY_PORT_VALIDATOR_H_
