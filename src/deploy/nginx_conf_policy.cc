#include <tavow3/nginx_conf_policy.h>

#include <tavow3/nginx_mode_recorder.h>

#include "base/log.h"

namespace {

constexpr char kLogTag[] = "nginx_deploy";

// The deployer of a known mode (doing its file work); null for any other value.
std::unique_ptr<NginxConfDeployer> MakeDeployer(NGINXCONF_TYPE type) {
  switch (type) {
    case NGINXCONF_NORMAL:
      return std::make_unique<DeployNginxConfNormal>();
    case NGINXCONF_ABNORMAL:
      return std::make_unique<DeployNginxConfAbnormal>();
    case NGINXCONF_DEFAULT:
      return std::make_unique<DeployNginxConfDefault>();
    default:
      return nullptr;
  }
}

bool IsKnownType(NGINXCONF_TYPE type) {
  return type >= NGINXCONF_NONE && type <= NGINXCONF_DEFAULT;
}

}  // namespace

NginxConfPolicy::NginxConfPolicy() : mode_(NGINXCONF_NONE) {}

NginxConfPolicy::NginxConfPolicy(NGINXCONF_TYPE type) : mode_(type) {
  if (!IsKnownType(type)) {
    TAVOW3_LOG_ERR_AT(300, "Cannot find nginx policy %d", static_cast<int>(type));
    mode_ = NGINXCONF_NONE;
    return;
  }
  deployer_ = MakeDeployer(type);
}

NginxConfPolicy::~NginxConfPolicy() = default;

bool NginxConfPolicy::ApplyConfPolicy(NGINXCONF_TYPE type) {
  mode_ = type;
  deployer_.reset();
  if (IsKnownType(type)) {
    deployer_ = MakeDeployer(type);
  } else {
    TAVOW3_LOG_ERR_AT(333, "Cannot find nginx policy %d", static_cast<int>(type));
    mode_ = NGINXCONF_NONE;
  }
  return IsConfValid();
}

bool NginxConfPolicy::IsConfValid() { return deployer_ != nullptr && deployer_->IsConfValid(); }

bool NginxConfPolicy::ApplyFirewallStrategy() {
  return deployer_ != nullptr && deployer_->ApplyFirewallStrategy();
}

std::string NginxConfPolicy::GetNginxModeString() const {
  return deployer_ != nullptr ? deployer_->GetNginxModeString() : std::string();
}

std::string NginxConfPolicy::GetNginxTestMsg() const {
  return deployer_ != nullptr ? deployer_->GetNginxTestMsg() : std::string();
}

bool NginxConfPolicy::RecordNginxMode() { return NginxModeRecorder::RecordMode(mode_); }
