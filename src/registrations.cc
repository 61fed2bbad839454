// The engine's built-in registration lists. They name the settings classes,
// so they live here, above every subsystem, and the engine never includes a
// settings header.
#include <tavow3/wwwservice.h>
#include <tavow3/zam.h>

#include "engine/engine_private.h"
#include "engine/engine_v2_private.h"

namespace tavow3 {

// The ResourceRegister callbacks of ZAM, AppPortal, ReverseProxy and
// WWWService, in that order. A class takes its place in this order when it
// joins the library.
const std::vector<EngineCallback>& BuiltinCallbacks() {
  static const std::vector<EngineCallback> callbacks = {
      &ZAM::ResourceRegister,
      &WWWService::ResourceRegister,
  };
  return callbacks;
}

// The ResourceRegisterV2 callbacks of ZAM, AppPortal, ReverseProxy and
// WWWService, in that order. A class takes its place in this order when it
// joins the library.
const std::vector<EngineV2Callback>& BuiltinV2Callbacks() {
  static const std::vector<EngineV2Callback> callbacks = {
      &ZAM::ResourceRegisterV2,
      &WWWService::ResourceRegisterV2,
  };
  return callbacks;
}

}  // namespace tavow3
