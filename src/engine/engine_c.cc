// The engine's exported C functions: each forwards to Engine in one line.
#include <tavow3/engine_c.h>

#include <tavow3/engine.h>

using tavow3::Engine;

extern "C" {

TAVOW3_EXPORT void* TAVOW3_Engine_Initialize(void) { return new Engine(); }

TAVOW3_EXPORT void TAVOW3_Engine_Release(void* engine) noexcept {
  delete static_cast<Engine*>(engine);
}

TAVOW3_EXPORT int TAVOW3_Engine_RegenAll(void* engine) {
  return static_cast<Engine*>(engine)->W3FwReGenAll();
}

TAVOW3_EXPORT int TAVOW3_Fw_RegenAll(void) { return Engine().W3FwReGenAll(); }

}  // extern "C"
