// Deployers: each installs one configuration mode of the web server.
#ifndef TAVOW3_NGINX_CONF_DEPLOYER_H_
#define TAVOW3_NGINX_CONF_DEPLOYER_H_

#include <memory>
#include <string>

#include <tavow3/export.h>
#include <tavow3/nginx_fw_strategy.h>

// A mode installed by construction: the subclass's constructor moves the
// generated main configuration into place and arranges the links under
// /etc/nginx (keeping whatever it changed when a step fails), and chooses the
// mode's firewall strategy, which the deployer owns. Used by one thread.
class TAVOW3_EXPORT NginxConfDeployer {
 public:
  virtual ~NginxConfDeployer();
  NginxConfDeployer(const NginxConfDeployer&) = delete;
  NginxConfDeployer& operator=(const NginxConfDeployer&) = delete;

  // False when the file work failed, otherwise the nginx test's result.
  [[nodiscard]] virtual bool IsConfValid();
  // "Normal", "Abnormal" or "Default".
  virtual std::string GetNginxModeString() const = 0;

  // Runs "nginx -t" and keeps its output (standard error included) as the
  // test message. True when nginx accepted the installed configuration.
  [[nodiscard]] bool TestNginxConf();
  // Applies the mode's firewall strategy; its result.
  [[nodiscard]] bool ApplyFirewallStrategy();
  // The output of the last nginx test; empty when none ran.
  std::string GetNginxTestMsg() const { return test_msg_; }

 protected:
  // Takes ownership of `strategy` (never null).
  explicit NginxConfDeployer(std::unique_ptr<NginxFwStrategy> strategy);

  bool valid = false;  // set by the subclass when its file work succeeded

 private:
  std::string test_msg_;
  std::unique_ptr<NginxFwStrategy> strategy_;
};

// Normal: the full configuration. Links /etc/nginx/conf.d,
// /etc/nginx/sites-enabled and /etc/nginx/app.d to their fragment directories.
// Firewall: FwStrategyClear.
class TAVOW3_EXPORT DeployNginxConfNormal : public NginxConfDeployer {
 public:
  DeployNginxConfNormal();
  std::string GetNginxModeString() const override;
};

// Abnormal: drops /etc/nginx/conf.d and /etc/nginx/sites-enabled and links
// only /etc/nginx/app.d. Firewall: FwStrategyClear.
class TAVOW3_EXPORT DeployNginxConfAbnormal : public NginxConfDeployer {
 public:
  DeployNginxConfAbnormal();
  std::string GetNginxModeString() const override;
};

// Default: touches no file and is always valid without running nginx.
// Firewall: FwStrategyZAMDefault.
class TAVOW3_EXPORT DeployNginxConfDefault : public NginxConfDeployer {
 public:
  DeployNginxConfDefault();
  [[nodiscard]] bool IsConfValid() override;
  std::string GetNginxModeString() const override;
};

#endif  // TAVOW3_NGINX_CONF_DEPLOYER_H_
