#include <tavow3/nginx_conf_policy.h>
#include <tavow3/nginx_mode_recorder.h>

#include <unistd.h>

#include <algorithm>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "deploy_fixtures.h"
#include "support/fake_tools.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::test {
namespace {

constexpr char kAppD[] = "/etc/nginx/app.d";
constexpr char kConfD[] = "/etc/nginx/conf.d";

// The packaged directories under /etc/nginx are replaced by links; they are
// removed here because the sandbox's overlay cannot rename them (EXDEV).
void PrepareGeneratedTree() {
  WriteBytes("/var/tmp/nginx/nginx.conf", MainConf("generated"));
  WriteBytes("/var/tmp/nginx/app.d/app.conf", "server { listen 127.0.0.1:8083; }\n");
  for (const char* path : {kAppD, kConfD, "/etc/nginx/sites-enabled"}) RemoveTree(path);
}

TEST(NginxConfPolicy, UnknownModesLeaveNoDeployer) {
  PrepareGeneratedTree();
  ClearLog();
  NginxConfPolicy made(static_cast<NGINXCONF_TYPE>(3));
  EXPECT_EQ(NGINXCONF_NONE, made.GetConfPolicy());
  EXPECT_EQ("", made.GetNginxModeString());
  EXPECT_FALSE(made.IsConfValid());
  EXPECT_FALSE(made.ApplyFirewallStrategy());
  EXPECT_EQ(std::vector<std::string>{"nginx_deploy:300 Cannot find nginx policy 3"},
            TaggedLogMessages("nginx_deploy"));

  NginxConfPolicy policy;
  EXPECT_EQ(NGINXCONF_NONE, policy.GetConfPolicy());
  ASSERT_TRUE(policy.ApplyConfPolicy(NGINXCONF_DEFAULT));
  ClearLog();
  EXPECT_FALSE(policy.ApplyConfPolicy(static_cast<NGINXCONF_TYPE>(3)));
  EXPECT_EQ(std::vector<std::string>{"nginx_deploy:333 Cannot find nginx policy 3"},
            TaggedLogMessages("nginx_deploy"));
  EXPECT_EQ(NGINXCONF_NONE, policy.GetConfPolicy());
  EXPECT_EQ("", policy.GetNginxModeString());
  EXPECT_EQ("", policy.GetNginxTestMsg());
  EXPECT_FALSE(policy.ApplyFirewallStrategy());

  ClearLog();
  EXPECT_FALSE(policy.ApplyConfPolicy(NGINXCONF_NONE));
  EXPECT_EQ(NGINXCONF_NONE, policy.GetConfPolicy());
  EXPECT_TRUE(TaggedLogMessages("nginx_deploy").empty());
  // Nothing was deployed by any of it.
  EXPECT_FALSE(PathExists(kAppD));
  EXPECT_TRUE(PathExists("/var/tmp/nginx/nginx.conf"));
}

TEST(NginxConfPolicy, ConstructionDeploysWithoutTesting) {
  PrepareGeneratedTree();
  NginxConfPolicy policy(NGINXCONF_NORMAL);
  EXPECT_EQ(NGINXCONF_NORMAL, policy.GetConfPolicy());
  EXPECT_EQ("Normal", policy.GetNginxModeString());
  EXPECT_EQ("/var/tmp/nginx/app.d", LinkTarget(kAppD));
  EXPECT_EQ("", policy.GetNginxTestMsg());
  EXPECT_TRUE(policy.IsConfValid());
  EXPECT_NE("", policy.GetNginxTestMsg());
}

TEST(NginxConfPolicy, DefaultAfterNormalKeepsTheFilesAndTakesTheDefaultFirewall) {
  PrepareGeneratedTree();
  WriteBytes("/usr/local/etc/nginx/conf.d/broken.conf", "bogus_directive on;\n");
  NginxConfPolicy policy;
  EXPECT_FALSE(policy.ApplyConfPolicy(NGINXCONF_NORMAL));
  EXPECT_TRUE(policy.GetNginxTestMsg().find("bogus_directive") != std::string::npos);
  const ino_t app_link = InodeOf(kAppD);

  EXPECT_TRUE(policy.ApplyConfPolicy(NGINXCONF_DEFAULT));
  EXPECT_EQ(NGINXCONF_DEFAULT, policy.GetConfPolicy());
  EXPECT_EQ("Default", policy.GetNginxModeString());
  EXPECT_EQ("", policy.GetNginxTestMsg());
  EXPECT_EQ(app_link, InodeOf(kAppD));
  EXPECT_EQ("/usr/local/etc/nginx/conf.d", LinkTarget(kConfD));

  EXPECT_TRUE(policy.ApplyFirewallStrategy());
  const std::vector<std::string> rules = IptablesRules();
  EXPECT_EQ(1, std::count(rules.begin(), rules.end(),
                          "-A ZAM_DEFAULT_FORWARD -p tcp -m multiport --dports 5000,5001 -j "
                          "ACCEPT"));
  EXPECT_TRUE(FakeCalls("tavofirewall").empty());

  // Back to Abnormal: its strategy clears the emergency rule again.
  EXPECT_TRUE(policy.ApplyConfPolicy(NGINXCONF_ABNORMAL)) << policy.GetNginxTestMsg();
  EXPECT_TRUE(policy.ApplyFirewallStrategy());
  for (const std::string& rule : IptablesRules()) {
    EXPECT_EQ(std::string::npos, rule.find("ZAM_DEFAULT_FORWARD")) << rule;
  }
  EXPECT_EQ(1u, FakeCalls("tavofirewall").size());
}

TEST(NginxConfPolicy, RecordsItsMode) {
  WriteBytes("/run/tavow3/force_default", "");  // no alert process here
  for (NGINXCONF_TYPE mode : {NGINXCONF_DEFAULT, NGINXCONF_NORMAL}) {
    SCOPED_TRACE(mode);
    NginxConfPolicy policy;
    ASSERT_TRUE(policy.ApplyConfPolicy(NGINXCONF_DEFAULT));
    if (mode == NGINXCONF_NORMAL) {
      PrepareGeneratedTree();
      ASSERT_TRUE(policy.ApplyConfPolicy(NGINXCONF_NORMAL)) << policy.GetNginxTestMsg();
    }
    EXPECT_TRUE(policy.RecordNginxMode());
    EXPECT_EQ(mode, NginxModeRecorder::GetMode());
  }
  ClearLog();
  NginxConfPolicy none;
  EXPECT_TRUE(none.RecordNginxMode());
  EXPECT_EQ(std::vector<std::string>{"nginx_deploy:719 Bad nginx mode to record"},
            TaggedLogMessages("nginx_deploy"));
  EXPECT_EQ(NGINXCONF_NORMAL, NginxModeRecorder::GetMode());
}

}  // namespace
}  // namespace tavow3::test
