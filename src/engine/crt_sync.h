// Certificate synchronisation of EngineV2: the certificate store's per-
// subscriber documents and tool runs, then the TLS-profile framework.
#ifndef TAVOW3_SRC_ENGINE_CRT_SYNC_H_
#define TAVOW3_SRC_ENGINE_CRT_SYNC_H_

#include <json/value.h>

#include <tavow3/engine_v2.h>

#include "base/export.h"

namespace tavow3 {

// Registers every subscriber of `security` with the certificate store and,
// when all registrations succeeded, joins every certificate resource to the
// TLS-profile framework. True when the framework accepted the list.
TAVOW3_INTERNAL bool SyncCertificates(const EngineV2::Security& security);

// The TLS-profile framework's document for every certificate resource of
// `security`: services named subscriber + "_" + service, with the display
// name and, when not empty, its localisation key.
TAVOW3_INTERNAL Json::Value TlsServiceDocument(const EngineV2::Security& security);

}  // namespace tavow3

#endif  // TAVOW3_SRC_ENGINE_CRT_SYNC_H_
