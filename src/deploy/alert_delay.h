// The delay of the web-server fall-back alert, shortened by tests.
#ifndef TAVOW3_SRC_DEPLOY_ALERT_DELAY_H_
#define TAVOW3_SRC_DEPLOY_ALERT_DELAY_H_

#include "base/export.h"

namespace tavow3::deploy {

// Seconds the detached alert process waits before it looks at the mode record again.
inline constexpr unsigned kAlertDelaySeconds = 13;

// Replaces the delay for later EmitAlert calls of this process (13 seconds
// until called). For tests only; not meant to race with EmitAlert.
TAVOW3_INTERNAL void SetAlertDelayForTesting(unsigned seconds);

}  // namespace tavow3::deploy

#endif  // TAVOW3_SRC_DEPLOY_ALERT_DELAY_H_
