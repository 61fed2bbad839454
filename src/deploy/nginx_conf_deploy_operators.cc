// The start-up and reload decisions: which configuration mode nginx runs in.
#include <syslog.h>

#include <tavo/tlib_service.h>
#include <tavow3/lock.h>
#include <tavow3/nginx_conf_operators.h>
#include <tavow3/nginx_conf_policy.h>
#include <tavow3/nginx_mode_recorder.h>

#include "base/log.h"

namespace {

constexpr char kLogTag[] = "nginx_deploy";

// The closing lines of both decisions: the chosen mode, then its record.
void ReportAndRecord(NginxConfPolicy* policy, std::string* msg) {
  *msg += "Start Nginx Server in " + policy->GetNginxModeString() + " Mode ......\n";
  if (!policy->RecordNginxMode()) *msg += "Failed to record nginx mode\n";
}

}  // namespace

int NginxConfOperatorDeployNginxInit::run() {
  msg_.clear();
  // Generation first; when it ran, its lock is held until the policy goes.
  NginxConfPolicyWithGenConf policy;
  bool use_normal = false;
  if (NginxConfOperatorForceDefault::IsForced()) {
    msg_ += "Detect force default config flag, change to default mode\n";
  } else if (!policy.IsFirewallOk()) {
    msg_ += "Firewall is not ok, change to default mode\n";
  } else if (!policy.IsCertificateOk()) {
    msg_ += "Certificate is not ok, change to default mode\n";
  } else if (policy.ApplyConfPolicy(NGINXCONF_NORMAL)) {
    use_normal = true;
  } else {
    msg_ += policy.GetNginxTestMsg();
    msg_ += "Failed to apply nginx normal mode, change to default mode\n";
  }
  // Default is valid by construction and touches no file.
  if (!use_normal) (void)policy.ApplyConfPolicy(NGINXCONF_DEFAULT);
  if (!policy.ApplyFirewallStrategy()) msg_ += "Failed to apply iptable rules...\n";
  ReportAndRecord(&policy, &msg_);
  return policy.GetConfPolicy();
}

int NginxConfOperatorDeployNginxHup::run() {
  msg_.clear();
  NginxConfPolicy policy;
  int pid = 0;
  int state = 0;
  if (TLIBServicectlStatus("nginx", &pid, &state) < 0) {
    TAVOW3_LOG_ERR_AT(891, "Failed to get nginx job status");
    return -1;
  }
  if (state != TLIB_SERVICE_RUNNING) {
    TAVOW3_LOG_ERR_AT(896, "nginx Job is not running");
    return -1;
  }
  const int mode = NginxModeRecorder::GetMode();
  if (mode == NGINXCONF_NONE) {
    TAVOW3_LOG_ERR_AT(902, "Cannot decide nginx mode");
    return -1;
  }
  if (mode == NGINXCONF_DEFAULT) {
    // Only the start-up decision leaves Default.
    tavow3::base::Log(LOG_INFO, kLogTag, 907, "nginx job is run in default mode");
    return NGINXCONF_DEFAULT;
  }
  Lock lock;
  if (!lock.lock()) {
    TAVOW3_LOG_ERR_AT(918, "Failed to get genente nginx config lock.");
    return -1;
  }
  if (!policy.ApplyConfPolicy(NGINXCONF_NORMAL)) {
    (void)policy.ApplyConfPolicy(NGINXCONF_ABNORMAL);
    TAVOW3_LOG_ERR_AT(915, "Nginx config has problem, change to abnormal mode");
  }
  lock.unlock();
  ReportAndRecord(&policy, &msg_);
  return policy.GetConfPolicy();
}
