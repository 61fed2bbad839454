// The operators of the web-server configuration manager that generate, test,
// deploy and report the configuration and pin it to the Default mode.
#ifndef TAVOW3_NGINX_CONF_OPERATORS_H_
#define TAVOW3_NGINX_CONF_OPERATORS_H_

#include <tavow3/export.h>
#include <tavow3/nginx_conf_operator.h>

// Start-up decision: generates everything (holding the generation lock for
// the whole run), then installs Normal unless the force-default flag, the
// firewall files, the certificates or the nginx test say Default; applies the
// mode's firewall strategy and records the mode. Returns 0 or 2, never 1.
class TAVOW3_EXPORT NginxConfOperatorDeployNginxInit : public tavow3::NginxConfOperator {
 public:
  int run() override;
};

// Reload decision for a running nginx job: in Normal or Abnormal, installs
// Normal again under the generation lock, or Abnormal when its test fails,
// and records it (0 or 1). Returns 2 and changes nothing in Default; -1 when
// the job is not running, the mode is unknown or the lock is not obtained.
// Never touches the firewall.
class TAVOW3_EXPORT NginxConfOperatorDeployNginxHup : public tavow3::NginxConfOperator {
 public:
  int run() override;
};

// Regenerates the firewall service file and the certificate information,
// then the temporary nginx configuration, and tests it. 0 when all of it
// succeeded, else -1.
class TAVOW3_EXPORT NginxConfOperatorGenW3Conf : public tavow3::NginxConfOperator {
 public:
  int run() override;
};

// Regenerates the library's firewall service file "tavow3.sc" from a fresh
// engine. 0 on success, -1 on a conflict or write failure.
class TAVOW3_EXPORT NginxConfOperatorGenW3SC : public tavow3::NginxConfOperator {
 public:
  int run() override;
};

// Runs the configuration generator under the generation lock and tests the
// temporary configuration. 0 when nginx accepts it, else -1.
class TAVOW3_EXPORT NginxConfOperatorGenNginxConf : public tavow3::NginxConfOperator {
 public:
  int run() override;
};

// Reports the recorded mode: 0 Normal, 1 Abnormal, 2 Default, -1 unknown.
class TAVOW3_EXPORT NginxConfOperatorGetMode : public tavow3::NginxConfOperator {
 public:
  int run() override;
};

// Creates the force-default flag "/run/tavow3/force_default", which makes
// every later start-up choose Default until the flag is removed (nothing in
// the library removes it). 0 on success, -1 logged; the message stays empty.
class TAVOW3_EXPORT NginxConfOperatorForceDefault : public tavow3::NginxConfOperator {
 public:
  int run() override;
  // Whether the flag exists (links followed). Uses no object state.
  [[nodiscard]] static bool IsForced();
};

// Reports the force-default flag: 1 when present, 0 when absent.
class TAVOW3_EXPORT NginxConfOperatorIsForcedDefault : public tavow3::NginxConfOperator {
 public:
  int run() override;
};

#endif  // TAVOW3_NGINX_CONF_OPERATORS_H_
