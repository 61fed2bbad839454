// Configuration policies: the chosen mode of the web server and its deployer.
#ifndef TAVOW3_NGINX_CONF_POLICY_H_
#define TAVOW3_NGINX_CONF_POLICY_H_

#include <memory>
#include <string>

#include <tavow3/export.h>
#include <tavow3/gen_w3_conf.h>
#include <tavow3/nginx_conf_deployer.h>
#include <tavow3/nginx_conf_type.h>

// Owns the deployer of the current mode. Applying a mode replaces the
// deployer, whose construction does the mode's file work. Made for one
// operator run; used by one thread.
class TAVOW3_EXPORT NginxConfPolicy {
 public:
  // No mode (-1) and no deployer.
  NginxConfPolicy();
  // Constructs the deployer of `type` (its file work included) without
  // testing it. NGINXCONF_NONE makes none; any other unknown value is logged
  // and gives mode -1 without a deployer.
  explicit NginxConfPolicy(NGINXCONF_TYPE type);
  ~NginxConfPolicy();
  NginxConfPolicy(const NginxConfPolicy&) = delete;
  NginxConfPolicy& operator=(const NginxConfPolicy&) = delete;

  // Replaces the deployer by that of `type` (unknown values as in the
  // constructor) and returns IsConfValid().
  [[nodiscard]] bool ApplyConfPolicy(NGINXCONF_TYPE type);
  // The deployer's validity (Normal and Abnormal run the nginx test); false
  // without a deployer.
  [[nodiscard]] bool IsConfValid();
  // The deployer's firewall strategy; false without a deployer.
  [[nodiscard]] bool ApplyFirewallStrategy();
  NGINXCONF_TYPE GetConfPolicy() const { return mode_; }
  // "Normal", "Abnormal", "Default", or "" without a deployer.
  std::string GetNginxModeString() const;
  // The output of the deployer's last nginx test, or "".
  std::string GetNginxTestMsg() const;
  // Records the mode (NginxModeRecorder::RecordMode); its result.
  [[nodiscard]] bool RecordNginxMode();

 private:
  NGINXCONF_TYPE mode_;
  std::unique_ptr<NginxConfDeployer> deployer_;  // null when none
};

// A policy whose generation (GenW3Conf, taking the generation lock when it
// generates) happens before any mode is applied; the lock is released only
// when the whole object is destroyed.
class TAVOW3_EXPORT NginxConfPolicyWithGenConf : public GenW3Conf, public NginxConfPolicy {
 public:
  NginxConfPolicyWithGenConf() = default;
  explicit NginxConfPolicyWithGenConf(NGINXCONF_TYPE type) : GenW3Conf(), NginxConfPolicy(type) {}
};

#endif  // TAVOW3_NGINX_CONF_POLICY_H_
