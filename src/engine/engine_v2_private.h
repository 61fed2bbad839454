// The process-wide list of built-in ResourceRegisterV2 callbacks.
#ifndef TAVOW3_SRC_ENGINE_ENGINE_V2_PRIVATE_H_
#define TAVOW3_SRC_ENGINE_ENGINE_V2_PRIVATE_H_

#include <vector>

#include <tavow3/engine_v2.h>

#include "base/export.h"

namespace tavow3 {

// ResourceRegisterV2 callbacks of the library's settings classes, in their
// fixed order (defined beside the settings classes, in src/registrations.cc).
TAVOW3_INTERNAL const std::vector<EngineV2Callback>& BuiltinV2Callbacks();

}  // namespace tavow3

#endif  // TAVOW3_SRC_ENGINE_ENGINE_V2_PRIVATE_H_
