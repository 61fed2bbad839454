// The configuration manager: operator numbers to operator objects, and the
// C interface's mode query.
#include <tavow3/nginx_conf_manager.h>

#include <typeinfo>
#include <utility>

#include <tavow3/nginx_conf_operators.h>
#include <tavow3/vantoro_proxy_operators.h>

#include "base/log.h"

namespace tavow3 {
namespace {

constexpr char kLogTag[] = "nginx_deploy";

// The operator of `op`, or null for a number that names none.
NginxConfOperator* MakeOperator(NGINXCONF_OPERATOR op) {
  switch (op) {
    case NGINXCONF_DEPLOY_INIT:
      return new NginxConfOperatorDeployNginxInit;
    case NGINXCONF_DEPLOY_HUP:
      return new NginxConfOperatorDeployNginxHup;
    case NGINXCONF_GEN_W3_CONF:
      return new NginxConfOperatorGenW3Conf;
    case NGINXCONF_GEN_W3_SC:
      return new NginxConfOperatorGenW3SC;
    case NGINXCONF_GEN_NGINX_CONF:
      return new NginxConfOperatorGenNginxConf;
    case NGINXCONF_GET_MODE:
      return new NginxConfOperatorGetMode;
    case NGINXCONF_FORCE_DEFAULT:
      return new NginxConfOperatorForceDefault;
    case NGINXCONF_IS_FORCED_DEFAULT:
      return new NginxConfOperatorIsForcedDefault;
    case NGINXCONF_SET_VANTORO_PROXY:
      return new NginxConfOperatorSetVantoroProxy;
    case NGINXCONF_CLEAR_VANTORO_PROXY:
      return new NginxConfOperatorClearVantoroProxy;
    case NGINXCONF_LIST_VANTORO_PROXY:
      return new NginxConfOperatorListVantoroProxy;
  }
  return nullptr;
}

}  // namespace

NginxConfOperator::~NginxConfOperator() = default;

NginxConfManager::NginxConfManager(NGINXCONF_OPERATOR op) : op_(MakeOperator(op)) {
  if (op_ == nullptr) TAVOW3_LOG_ERR_AT(800, "bad parrameter");
}

NginxConfManager::~NginxConfManager() { delete op_; }

int NginxConfManager::run() { return op_ != nullptr ? op_->run() : -1; }

int NginxConfManager::run_with_args(std::vector<std::string> args) {
  if (op_ == nullptr) return -1;
  auto* with_args = dynamic_cast<NginxConfOperatorWithArgs*>(op_);
  if (with_args == nullptr) {
    // The compiler's name of the run-time type; a leading '*' marks a name
    // local to its translation unit and is not part of it.
    const char* type_name = typeid(*op_).name();
    if (*type_name == '*') ++type_name;
    TAVOW3_LOG_ERR_AT(826, "%s not support setting argument.", type_name);
    return -1;
  }
  if (!with_args->set_args(std::move(args))) return -1;
  return with_args->run();
}

std::string NginxConfManager::GetMsg() const {
  return op_ != nullptr ? op_->GetMsg() : std::string();
}

}  // namespace tavow3

extern "C" int TAVOServiceIsHttpDefaultConf(void) {
  tavow3::NginxConfManager manager(NGINXCONF_GET_MODE);
  const int mode = manager.run();
  if (mode == 0 || mode == -1) return mode;
  return 1;
}
