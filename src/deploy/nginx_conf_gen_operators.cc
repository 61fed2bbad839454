// The operators that generate the firewall service file and the temporary
// nginx configuration.
#include <tavow3/engine.h>
#include <tavow3/gen_nginx_conf.h>
#include <tavow3/gen_w3_conf.h>
#include <tavow3/nginx_conf_operators.h>

namespace {

constexpr char kFirewallFailed[] = "Cannot update tavow3.sc, port or section conflict occur\n";
constexpr char kFirewallDone[] = "Generate tavow3.sc successfully\n";
constexpr char kTmpConfInvalid[] = "Generated nginx tmp config is not valid\n";

}  // namespace

int NginxConfOperatorGenW3Conf::run() {
  msg_.clear();
  GenW3Conf generation;  // holds the generation lock, when it generated, until it goes
  if (!generation.IsFirewallOk()) {
    msg_ += kFirewallFailed;
    return -1;
  }
  msg_ = kFirewallDone;
  if (!generation.IsCertificateOk()) {
    msg_ += "Cannot sync certificate\n";
    return -1;
  }
  // Replaces the firewall line: callers have always seen these two lines only.
  msg_ = "Sync W3 certificate info successfully\n";
  if (!generation.TestNginxTmpConf()) {
    msg_ += kTmpConfInvalid;
    return -1;
  }
  msg_ += "Generate nginx tmp config successfully\n";
  return 0;
}

int NginxConfOperatorGenW3SC::run() {
  msg_.clear();
  tavow3::Engine engine;
  if (!engine.W3FwReGenAll()) {
    msg_ += kFirewallFailed;
    return -1;
  }
  msg_ += kFirewallDone;
  return 0;
}

int NginxConfOperatorGenNginxConf::run() {
  msg_.clear();
  bool valid;
  {
    GenNginxConf generation;  // the test runs under the same lock as the generator
    valid = generation.TestNginxTmpConf();
  }
  if (!valid) {
    msg_ = kTmpConfInvalid;
    return -1;
  }
  msg_ = "Generate nginx tmp config\n";
  return 0;
}
