// The section objects of a firewall service file: the JSON document that the
// mustache template turns into one ".sc" section per port.
#ifndef TAVOW3_SRC_ENGINE_FIREWALL_SECTIONS_H_
#define TAVOW3_SRC_ENGINE_FIREWALL_SECTIONS_H_

#include <json/value.h>

#include <string>

#include "base/export.h"
#include "engine/engine_private.h"

namespace tavow3 {

// The array of section objects for the host-name resources of `owner` in
// `registry`, one per port in ascending port order. Empty when the owner has
// no resources. Reads the registry only; the caller loads it first.
TAVOW3_INTERNAL Json::Value BuildFirewallSections(const Engine::Private& registry,
                                                  const std::string& owner);

}  // namespace tavow3

#endif  // TAVOW3_SRC_ENGINE_FIREWALL_SECTIONS_H_
