// The operators that report the recorded mode and set or report the
// force-default flag.
#include <tavo/tavofs.h>
#include <tavo/tlib_file.h>
#include <tavow3/nginx_conf_operators.h>
#include <tavow3/nginx_mode_recorder.h>

#include "base/log.h"
#include "deploy/force_default_flag.h"

namespace {

constexpr char kLogTag[] = "nginx_deploy";

}  // namespace

int NginxConfOperatorGetMode::run() {
  switch (NginxModeRecorder::GetMode()) {
    case NGINXCONF_NORMAL:
      msg_ = "Nginx run in normal mode\n";
      return 0;
    case NGINXCONF_ABNORMAL:
      msg_ = "Nginx run in abnormal mode\n";
      return 1;
    case NGINXCONF_DEFAULT:
      msg_ = "Nginx run in default mode\n";
      return 2;
    case NGINXCONF_NONE:
      msg_ = "Failed to get nginx mode\n";
      return -1;
    default:
      msg_ = "Failed to find nginx mode define\n";
      return -1;
  }
}

int NginxConfOperatorForceDefault::run() {
  using tavow3::deploy::kForceDefaultDir;
  using tavow3::deploy::kForceDefaultFlag;
  if (TAVOFSMkdirP(kForceDefaultDir, 0, 0755) != 0) {
    TAVOW3_LOG_ERR_AT(1041, "Faild to mkdir /run/tavow3");
    return -1;
  }
  if (TLIBCFileTouch(kForceDefaultFlag) != 0) {
    TAVOW3_LOG_ERR_AT(1045, "Failed to create force default flag");
    return -1;
  }
  return 0;
}

bool NginxConfOperatorForceDefault::IsForced() { return tavow3::deploy::IsForceDefaultFlagSet(); }

int NginxConfOperatorIsForcedDefault::run() {
  if (NginxConfOperatorForceDefault::IsForced()) {
    msg_ += "Nginx is forced to default mode\n";
    return 1;
  }
  msg_ += "Nginx is not forced to default mode\n";
  return 0;
}
