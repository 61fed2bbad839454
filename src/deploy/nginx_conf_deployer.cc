// The three configuration modes and the nginx test of the installed configuration.
#include <tavow3/nginx_conf_deployer.h>

#include <cstdio>
#include <utility>

#include <tavo/tlib_exec.h>
#include <tavo/tlib_file.h>

#include "base/file_io.h"
#include "deploy/nginx_links.h"

namespace {

namespace base = tavow3::base;
using tavow3::deploy::MakeLink;
using tavow3::deploy::RemovePath;

constexpr char kNginx[] = "/usr/bin/nginx";
constexpr char kGeneratedMainConf[] = "/var/tmp/nginx/nginx.conf";
constexpr char kMainConf[] = "/etc/nginx/nginx.conf";
constexpr char kConfDLink[] = "/etc/nginx/conf.d";
constexpr char kConfDTarget[] = "/usr/local/etc/nginx/conf.d";
constexpr char kSitesLink[] = "/etc/nginx/sites-enabled";
constexpr char kSitesTarget[] = "/usr/local/etc/nginx/sites-enabled";
constexpr char kAppDLink[] = "/etc/nginx/app.d";
constexpr char kAppDTarget[] = "/var/tmp/nginx/app.d";

// Moves the generated main configuration over the installed one, when there
// is one. Only mv's exit status 1 (it could not move) counts as failure.
bool InstallMainConf() {
  if (TLIBCFileExist(kGeneratedMainConf) != 1) return true;
  return TLIBCExec("/bin/mv", kGeneratedMainConf, kMainConf) != 1;
}

// Removes `path` when it exists, links followed.
bool RemoveIfExists(const char* path) {
  return TLIBCFileExist(path) != 1 || RemovePath(path);
}

}  // namespace

NginxConfDeployer::NginxConfDeployer(std::unique_ptr<NginxFwStrategy> strategy)
    : strategy_(std::move(strategy)) {}

NginxConfDeployer::~NginxConfDeployer() = default;

bool NginxConfDeployer::IsConfValid() { return valid && TestNginxConf(); }

bool NginxConfDeployer::TestNginxConf() {
  test_msg_.clear();
  static const char* const kTestArgv[] = {kNginx, "-t", nullptr};
  FILE* stream = TLIBCPopen(kTestArgv, "rB");
  if (stream == nullptr) {
    test_msg_ = "Failed to Popoen nginx -t\n";
    return false;
  }
  // Output lines are kept whole, newlines included; a read error keeps what came.
  (void)base::ReadAll(fileno(stream), &test_msg_);
  return TLIBCPclose(stream) == 0;
}

bool NginxConfDeployer::ApplyFirewallStrategy() { return strategy_->ApplyFirewallStrategy(); }

DeployNginxConfNormal::DeployNginxConfNormal()
    : NginxConfDeployer(std::make_unique<FwStrategyClear>()) {
  valid = InstallMainConf() && MakeLink(kConfDTarget, kConfDLink) &&
           MakeLink(kSitesTarget, kSitesLink) && MakeLink(kAppDTarget, kAppDLink);
}

std::string DeployNginxConfNormal::GetNginxModeString() const { return "Normal"; }

DeployNginxConfAbnormal::DeployNginxConfAbnormal()
    : NginxConfDeployer(std::make_unique<FwStrategyClear>()) {
  valid = InstallMainConf() && RemoveIfExists(kConfDLink) && RemoveIfExists(kSitesLink) &&
           MakeLink(kAppDTarget, kAppDLink);
}

std::string DeployNginxConfAbnormal::GetNginxModeString() const { return "Abnormal"; }

DeployNginxConfDefault::DeployNginxConfDefault()
    : NginxConfDeployer(std::make_unique<FwStrategyZAMDefault>()) {
  valid = true;
}

bool DeployNginxConfDefault::IsConfValid() { return valid; }

std::string DeployNginxConfDefault::GetNginxModeString() const { return "Default"; }
