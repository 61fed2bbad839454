/* Plain C interface of the engine. An engine is an opaque pointer to a
 * heap-allocated Engine handle, owned by the caller from
 * TAVOW3_Engine_Initialize to TAVOW3_Engine_Release; the service objects'
 * exported functions take the same pointer. The functions may be called from
 * any thread; one handle is used as the Engine class allows. */
#ifndef TAVOW3_ENGINE_C_H_
#define TAVOW3_ENGINE_C_H_

#include <tavow3/export.h>

#ifdef __cplusplus
#define TAVOW3_C_NOEXCEPT noexcept
extern "C" {
#else
#define TAVOW3_C_NOEXCEPT
#endif

/* A new engine with its own registry (lock file opened and share-locked when
 * possible, empty, not loaded). Never null; allocation failure is not caught. */
TAVOW3_EXPORT void* TAVOW3_Engine_Initialize(void);

/* Frees `engine`; null is ignored. Dropping the last reference closes the
 * engine's lock file. Nothing escapes: a failure here ends the process. */
TAVOW3_EXPORT void TAVOW3_Engine_Release(void* engine) TAVOW3_C_NOEXCEPT;

/* Regenerates the library's firewall service file from `engine` (not null),
 * loading its registry on first use: 1 success, 0 failure. */
TAVOW3_EXPORT int TAVOW3_Engine_RegenAll(void* engine);

/* As TAVOW3_Engine_RegenAll on a temporary engine, so every call sees the
 * settings as stored at that moment. */
TAVOW3_EXPORT int TAVOW3_Fw_RegenAll(void);

#ifdef __cplusplus
}
#endif

#endif /* TAVOW3_ENGINE_C_H_ */
