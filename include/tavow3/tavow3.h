// Umbrella header: every public header of libtavow3.
#ifndef TAVOW3_TAVOW3_H_
#define TAVOW3_TAVOW3_H_

#include <tavow3/export.h>
#include <tavow3/engine_v2.h>
#include <tavow3/engine_c.h>
#include <tavow3/port_validator.h>
#include <tavow3/tls_registration.h>
#include <tavow3/validator.h>

#endif  // TAVOW3_TAVOW3_H_
