#include "engine_c_calls.h"

#include <stddef.h>
#include <tavow3/engine_c.h>

void CReleaseNull(void) { TAVOW3_Engine_Release(NULL); }

void CRegenTwice(int results[2]) {
  void* engine = TAVOW3_Engine_Initialize();
  results[0] = TAVOW3_Engine_RegenAll(engine);
  results[1] = TAVOW3_Engine_RegenAll(engine);
  TAVOW3_Engine_Release(engine);
}

int CRegenTemporary(void) { return TAVOW3_Fw_RegenAll(); }
