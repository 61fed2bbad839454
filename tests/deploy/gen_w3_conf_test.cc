#include <tavow3/gen_w3_conf.h>
#include <tavow3/nginx_conf_policy.h>

#include <sys/file.h>

#include <string>

#include <gtest/gtest.h>

#include "deploy_fixtures.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::test {
namespace {

constexpr char kLockPath[] = "/run/lock/nginx_gen.lock";

// A lock file never created is held by nobody.
bool GenerationLockIsFree() { return !PathExists(kLockPath) || CanFlock(kLockPath, LOCK_EX); }

TEST(GenW3Conf, GeneratesUnderTheLockOnlyWhenFirewallAndCertificatesAreOk) {
  const struct {
    const char* name;
    bool firewall_ok;
    bool certificate_ok;
  } cases[] = {
      {"both ok", true, true},
      {"firewall fails", false, true},
      {"certificates fail", true, false},
      {"both fail", false, false},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    InstallGenerator(/*valid=*/true);
    // A directory where the service file goes, and a file where the TLS
    // store's directory goes, break the two steps.
    RemoveTree("/usr/tavo/etc/services.d/tavow3.sc");
    RemoveTree("/usr/tavo/etc/tls");
    if (!c.firewall_ok) WriteBytes("/usr/tavo/etc/services.d/tavow3.sc/in-the-way", "");
    if (!c.certificate_ok) WriteBytes("/usr/tavo/etc/tls", "");
    const int runs = GeneratorRuns();
    {
      GenW3Conf generation;
      EXPECT_EQ(c.firewall_ok, generation.IsFirewallOk());
      EXPECT_EQ(c.certificate_ok, generation.IsCertificateOk());
      const bool generated = c.firewall_ok && c.certificate_ok;
      EXPECT_EQ(generated ? runs + 1 : runs, GeneratorRuns());
      EXPECT_EQ(generated, generation.TestNginxTmpConf());
      EXPECT_EQ(!generated, GenerationLockIsFree());
      // Certificates are synchronised even after the firewall failed.
      if (c.certificate_ok) {
        EXPECT_TRUE(PathExists("/usr/tavo/etc/tls/services.json"));
      }
    }
    EXPECT_TRUE(GenerationLockIsFree());
  }
}

TEST(NginxConfPolicyWithGenConf, GeneratesBeforeDeployingAndHoldsTheLockToTheEnd) {
  InstallGenerator(/*valid=*/true);
  for (const char* dir : {"/etc/nginx/conf.d", "/etc/nginx/sites-enabled", "/etc/nginx/app.d"}) {
    RemoveTree(dir);
  }
  {
    NginxConfPolicyWithGenConf policy(NGINXCONF_NORMAL);
    EXPECT_EQ(1, GeneratorRuns());
    // The generated main configuration was there for the deployer to install.
    EXPECT_EQ(MainConf("generated"), ReadBytes("/etc/nginx/nginx.conf"));
    EXPECT_TRUE(policy.IsConfValid()) << policy.GetNginxTestMsg();
    EXPECT_TRUE(policy.ApplyConfPolicy(NGINXCONF_DEFAULT));
    EXPECT_FALSE(GenerationLockIsFree());
  }
  EXPECT_TRUE(GenerationLockIsFree());
  {
    NginxConfPolicyWithGenConf policy;
    EXPECT_EQ(NGINXCONF_NONE, policy.GetConfPolicy());
    EXPECT_EQ(2, GeneratorRuns());
    EXPECT_TRUE(policy.TestNginxTmpConf());
    EXPECT_FALSE(GenerationLockIsFree());
  }
}

}  // namespace
}  // namespace tavow3::test
