#include <tavow3/nginx_conf_deployer.h>

#include <unistd.h>

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "deploy_fixtures.h"
#include "support/test_files.h"

namespace tavow3::test {
namespace {

constexpr char kTempConf[] = "/var/tmp/nginx/nginx.conf";
constexpr char kMainConf[] = "/etc/nginx/nginx.conf";
constexpr char kConfD[] = "/etc/nginx/conf.d";
constexpr char kSites[] = "/etc/nginx/sites-enabled";
constexpr char kAppD[] = "/etc/nginx/app.d";
constexpr char kConfDTarget[] = "/usr/local/etc/nginx/conf.d";
constexpr char kSitesTarget[] = "/usr/local/etc/nginx/sites-enabled";
constexpr char kAppDTarget[] = "/var/tmp/nginx/app.d";

bool Contains(const std::string& text, const std::string& part) {
  return text.find(part) != std::string::npos;
}

// A generated tree and fragments that nginx accepts, with real directories
// where the links must go (as a freshly installed nginx has them). They are
// made anew: the sandbox's overlay cannot rename the packaged ones (EXDEV).
void PrepareGeneratedTree() {
  RemoveTree(kTempConf);
  WriteBytes(kTempConf, MainConf("generated"));
  WriteBytes(std::string(kConfDTarget) + "/good.conf", "server { listen 127.0.0.1:8081; }\n");
  WriteBytes(std::string(kSitesTarget) + "/site", "server { listen 127.0.0.1:8082; }\n");
  WriteBytes(std::string(kAppDTarget) + "/app.conf", "server { listen 127.0.0.1:8083; }\n");
  for (const char* dir : {kConfD, kSites, kAppD}) RemoveTree(dir);
  WriteBytes(std::string(kConfD) + "/old.conf", "this is not nginx syntax\n");
  WriteBytes(std::string(kSites) + "/old", "neither is this\n");
}

void BreakFragment(const std::string& dir) {
  WriteBytes(dir + "/broken.conf", "server { listen 127.0.0.1:8084; bogus_directive on; }\n");
}

TEST(DeployNginxConfNormal, InstallsTheConfigurationAndLinksAndKeepsThemNextTime) {
  PrepareGeneratedTree();
  DeployNginxConfNormal normal;
  EXPECT_EQ("Normal", normal.GetNginxModeString());
  EXPECT_TRUE(normal.GetNginxTestMsg().empty());  // construction does not test
  EXPECT_TRUE(normal.IsConfValid()) << normal.GetNginxTestMsg();
  EXPECT_TRUE(Contains(normal.GetNginxTestMsg(), "syntax is ok\n"));
  EXPECT_TRUE(Contains(normal.GetNginxTestMsg(), "test is successful\n"));

  EXPECT_EQ(MainConf("generated"), ReadBytes(kMainConf));
  EXPECT_FALSE(PathExists(kTempConf));
  EXPECT_EQ(kConfDTarget, LinkTarget(kConfD));
  EXPECT_EQ(kSitesTarget, LinkTarget(kSites));
  EXPECT_EQ(kAppDTarget, LinkTarget(kAppD));
  // The real directories that stood in the way are kept as backups.
  ASSERT_EQ(1u, BackupsOf(kConfD).size());
  EXPECT_EQ("this is not nginx syntax\n", ReadBytes(BackupsOf(kConfD)[0] + "/old.conf"));
  EXPECT_EQ(std::string(kConfD).size() + 7, BackupsOf(kConfD)[0].size());
  ASSERT_EQ(1u, BackupsOf(kSites).size());
  EXPECT_EQ("neither is this\n", ReadBytes(BackupsOf(kSites)[0] + "/old"));
  EXPECT_TRUE(BackupsOf(kAppD).empty());

  // Next time, without a generated main configuration: all is kept as it is.
  const ino_t links[] = {InodeOf(kConfD), InodeOf(kSites), InodeOf(kAppD)};
  DeployNginxConfNormal again;
  EXPECT_TRUE(again.IsConfValid()) << again.GetNginxTestMsg();
  EXPECT_EQ(MainConf("generated"), ReadBytes(kMainConf));
  EXPECT_EQ(links[0], InodeOf(kConfD));
  EXPECT_EQ(links[1], InodeOf(kSites));
  EXPECT_EQ(links[2], InodeOf(kAppD));
  EXPECT_EQ(1u, BackupsOf(kConfD).size());
  EXPECT_EQ(1u, BackupsOf(kSites).size());
}

TEST(DeployNginxConfNormal, BrokenFragmentFailsWithNginxsOwnReport) {
  for (const char* dir : {kConfDTarget, kSitesTarget, kAppDTarget}) {
    SCOPED_TRACE(dir);
    PrepareGeneratedTree();
    for (const char* other : {kConfDTarget, kSitesTarget, kAppDTarget}) {
      ::unlink((std::string(other) + "/broken.conf").c_str());
    }
    BreakFragment(dir);
    DeployNginxConfNormal normal;
    EXPECT_FALSE(normal.IsConfValid());
    const std::string link = std::string(dir) == kConfDTarget  ? kConfD
                             : std::string(dir) == kSitesTarget ? kSites
                                                                : kAppD;
    EXPECT_TRUE(Contains(normal.GetNginxTestMsg(), "unknown directive \"bogus_directive\" in " +
                                                       link + "/broken.conf:1"))
        << normal.GetNginxTestMsg();
    EXPECT_TRUE(Contains(normal.GetNginxTestMsg(), "test failed\n"));
  }
}

TEST(DeployNginxConfNormal, KeepsTheInstalledConfigurationWithoutAGeneratedOne) {
  PrepareGeneratedTree();
  ASSERT_EQ(0, ::unlink(kTempConf));
  WriteBytes(kMainConf, MainConf("installed"));
  DeployNginxConfNormal normal;
  EXPECT_TRUE(normal.IsConfValid()) << normal.GetNginxTestMsg();
  EXPECT_EQ(MainConf("installed"), ReadBytes(kMainConf));
  EXPECT_EQ(kAppDTarget, LinkTarget(kAppD));
}

TEST(NginxConfDeployer, FailedInstallOfTheMainConfigurationStopsTheFileWork) {
  for (bool abnormal : {false, true}) {
    SCOPED_TRACE(abnormal ? "abnormal" : "normal");
    PrepareGeneratedTree();
    // mv cannot put a directory over the installed file: exit status 1.
    ASSERT_EQ(0, ::unlink(kTempConf));
    WriteBytes(std::string(kTempConf) + "/inside", "x\n");
    WriteBytes(kMainConf, MainConf("installed"));
    std::unique_ptr<NginxConfDeployer> deployer;
    if (abnormal) {
      deployer = std::make_unique<DeployNginxConfAbnormal>();
    } else {
      deployer = std::make_unique<DeployNginxConfNormal>();
    }
    EXPECT_FALSE(deployer->IsConfValid());
    EXPECT_TRUE(deployer->GetNginxTestMsg().empty());  // nginx never ran
    EXPECT_EQ(MainConf("installed"), ReadBytes(kMainConf));
    EXPECT_TRUE(IsDirectory(kConfD));
    EXPECT_TRUE(BackupsOf(kConfD).empty());
    EXPECT_FALSE(PathExists(kAppD));
  }
}

TEST(DeployNginxConfAbnormal, DropsConfDAndSitesEnabledButKeepsAppD) {
  PrepareGeneratedTree();
  BreakFragment(kConfDTarget);
  BreakFragment(kSitesTarget);
  DeployNginxConfNormal normal;
  ASSERT_FALSE(normal.IsConfValid());
  const ino_t app_link = InodeOf(kAppD);

  DeployNginxConfAbnormal abnormal;
  EXPECT_EQ("Abnormal", abnormal.GetNginxModeString());
  EXPECT_TRUE(abnormal.IsConfValid()) << abnormal.GetNginxTestMsg();
  EXPECT_TRUE(Contains(abnormal.GetNginxTestMsg(), "test is successful\n"));
  EXPECT_FALSE(PathExists(kConfD));
  EXPECT_FALSE(PathExists(kSites));
  EXPECT_EQ(1u, BackupsOf(kConfD).size());  // only the one Normal made
  EXPECT_EQ(app_link, InodeOf(kAppD));
  // The fragments themselves stay where they are.
  EXPECT_TRUE(PathExists(std::string(kConfDTarget) + "/broken.conf"));
  EXPECT_TRUE(PathExists(std::string(kSitesTarget) + "/broken.conf"));

  // app.d is still loaded: a broken application fragment fails Abnormal too.
  BreakFragment(kAppDTarget);
  DeployNginxConfAbnormal broken_app;
  EXPECT_FALSE(broken_app.IsConfValid());
  EXPECT_TRUE(Contains(broken_app.GetNginxTestMsg(), "/etc/nginx/app.d/broken.conf:1"));
}

TEST(DeployNginxConfAbnormal, MovesRealDirectoriesAside) {
  PrepareGeneratedTree();
  DeployNginxConfAbnormal abnormal;
  EXPECT_TRUE(abnormal.IsConfValid()) << abnormal.GetNginxTestMsg();
  EXPECT_FALSE(PathExists(kConfD));
  EXPECT_FALSE(PathExists(kSites));
  ASSERT_EQ(1u, BackupsOf(kConfD).size());
  EXPECT_EQ("this is not nginx syntax\n", ReadBytes(BackupsOf(kConfD)[0] + "/old.conf"));
  ASSERT_EQ(1u, BackupsOf(kSites).size());
  EXPECT_EQ(kAppDTarget, LinkTarget(kAppD));
}

TEST(DeployNginxConfDefault, TouchesNothingAndIsValidWithoutNginx) {
  PrepareGeneratedTree();
  WriteBytes(kMainConf, "broken {\n");
  ASSERT_EQ(0, ::unlink("/usr/bin/nginx"));
  DeployNginxConfDefault deployer;
  EXPECT_EQ("Default", deployer.GetNginxModeString());
  EXPECT_TRUE(deployer.IsConfValid());
  EXPECT_TRUE(deployer.GetNginxTestMsg().empty());
  EXPECT_EQ(MainConf("generated"), ReadBytes(kTempConf));
  EXPECT_EQ("broken {\n", ReadBytes(kMainConf));
  EXPECT_TRUE(IsDirectory(kConfD));
  EXPECT_TRUE(IsDirectory(kSites));
  EXPECT_FALSE(PathExists(kAppD));
  EXPECT_TRUE(BackupsOf(kConfD).empty());
}

TEST(NginxConfDeployer, NginxThatCannotStartFailsTheTest) {
  PrepareGeneratedTree();
  ASSERT_EQ(0, ::unlink("/usr/bin/nginx"));
  DeployNginxConfNormal normal;
  EXPECT_FALSE(normal.IsConfValid());
  EXPECT_EQ("Failed to Popoen nginx -t\n", normal.GetNginxTestMsg());
  EXPECT_EQ(kAppDTarget, LinkTarget(kAppD));  // the file work was done
}

}  // namespace
}  // namespace tavow3::test
