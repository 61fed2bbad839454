// The reload decision (operator 1): job state, recorded mode, lock and the
// Normal-else-Abnormal choice with the real nginx test.
#include <tavow3/nginx_conf_manager.h>

#include <syslog.h>

#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "base/fault.h"
#include "manager_fixtures.h"
#include "support/fake_tools.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::test {
namespace {

using Lines = std::vector<std::string>;
namespace fault = base::fault;

// A deployed Normal configuration from the real generator, mode 0. The
// force-default flag set afterwards keeps the Abnormal alert process away;
// reloads do not look at it.
void DeployNormal() {
  NginxConfManager init(NGINXCONF_DEPLOY_INIT);
  ASSERT_EQ(0, init.run()) << init.GetMsg();
  WriteBytes(kForceDefaultFlag, "");
  ClearFakeCalls("tavofirewall");
}

struct Snapshot {
  std::string main_conf, conf_d, sites, app_d, record;
  bool operator==(const Snapshot& o) const {
    return main_conf == o.main_conf && conf_d == o.conf_d && sites == o.sites &&
           app_d == o.app_d && record == o.record;
  }
};

Snapshot Take() {
  return {ReadBytes(kMainConf), LinkTarget("/etc/nginx/conf.d"),
          LinkTarget("/etc/nginx/sites-enabled"), LinkTarget("/etc/nginx/app.d"),
          ModeRecordText()};
}

struct RefusalCase {
  const char* name;
  // nullptr: none; "self": this process; "dir": a directory; else its content.
  const char* pid_file;
  const char* record;    // nullptr: no record
  int result;
  Lines log;
  int priority;
};

TEST(DeployNginxHup, ChangesNothingUnlessTheJobRunsInNormalOrAbnormal) {
  DeployNormal();
  const std::vector<RefusalCase> cases = {
      {"job stopped", nullptr, "0", -1, {"nginx_deploy:896 nginx Job is not running"}, LOG_ERR},
      {"stale pid", "999999\n", "0", -1, {"nginx_deploy:896 nginx Job is not running"}, LOG_ERR},
      {"status unreadable", "dir", "0", -1, {"nginx_deploy:891 Failed to get nginx job status"},
       LOG_ERR},
      {"mode unknown", "self", nullptr, -1,
       {"nginx_deploy:635 Failed to open share memory, No such file or directory",
        "nginx_deploy:902 Cannot decide nginx mode"},
       LOG_ERR},
      {"Default", "self", "2", 2, {"nginx_deploy:907 nginx job is run in default mode"}, LOG_INFO},
  };
  // A broken fragment would switch to Abnormal if anything were deployed.
  WriteBytes("/usr/local/etc/nginx/conf.d/broken.conf", "bogus_directive on;\n");
  for (const RefusalCase& c : cases) {
    SCOPED_TRACE(c.name);
    RemoveTree("/run/nginx.pid");
    const std::string pid_file = c.pid_file != nullptr ? c.pid_file : "";
    if (pid_file == "self") {
      PretendNginxRuns();
    } else if (pid_file == "dir") {
      ASSERT_EQ(0, RunCommand({"/bin/mkdir", "/run/nginx.pid"}).status);
    } else if (!pid_file.empty()) {
      WriteBytes("/run/nginx.pid", pid_file);
    }
    ASSERT_EQ(0, RunCommand({"/bin/rm", "-f", "/dev/shm/nginx_mod"}).status);
    if (c.record != nullptr) WriteModeRecord(c.record);
    const Snapshot before = Take();
    ClearLog();
    NginxConfManager manager(NGINXCONF_DEPLOY_HUP);
    EXPECT_EQ(c.result, manager.run());
    EXPECT_EQ("", manager.GetMsg());
    EXPECT_EQ(c.log, TaggedLogMessages("nginx_deploy"));
    EXPECT_EQ(c.log.back(), TaggedLogMessages("nginx_deploy", c.priority).back());
    EXPECT_TRUE(before == Take());
  }
  EXPECT_TRUE(FakeCalls("tavofirewall").empty());
}

TEST(DeployNginxHup, KeepsNormalAndSwitchesABrokenConfigurationToAbnormal) {
  DeployNormal();
  PretendNginxRuns();
  for (const char* record : {"0", "1"}) {
    SCOPED_TRACE(record);
    WriteModeRecord(record);
    ClearLog();
    NginxConfManager manager(NGINXCONF_DEPLOY_HUP);
    EXPECT_EQ(0, manager.run());
    EXPECT_EQ("Start Nginx Server in Normal Mode ......\n", manager.GetMsg());
    EXPECT_EQ("0", ModeRecordText());
    EXPECT_EQ("/usr/local/etc/nginx/conf.d", LinkTarget("/etc/nginx/conf.d"));
    EXPECT_TRUE(TaggedLogMessages("nginx_deploy").empty());
  }

  WriteBytes("/usr/local/etc/nginx/conf.d/broken.conf", "bogus_directive on;\n");
  ClearLog();
  NginxConfManager manager(NGINXCONF_DEPLOY_HUP);
  EXPECT_EQ(1, manager.run());
  EXPECT_EQ("Start Nginx Server in Abnormal Mode ......\n", manager.GetMsg());
  EXPECT_EQ(Lines{"nginx_deploy:915 Nginx config has problem, change to abnormal mode"},
            TaggedLogMessages("nginx_deploy"));
  EXPECT_EQ("1", ModeRecordText());
  EXPECT_FALSE(PathExists("/etc/nginx/conf.d"));
  EXPECT_FALSE(PathExists("/etc/nginx/sites-enabled"));
  EXPECT_EQ("/var/tmp/nginx/app.d", LinkTarget("/etc/nginx/app.d"));
  const RunResult test = RunCommand({"/usr/bin/nginx", "-t"});
  EXPECT_EQ(0, test.status) << test.err;
  EXPECT_TRUE(FakeCalls("tavofirewall").empty());  // no firewall action on reload
  EXPECT_FALSE(HasDefaultRule());

  // Repaired: the next reload returns to Normal.
  RemoveTree("/usr/local/etc/nginx/conf.d/broken.conf");
  NginxConfManager repaired(NGINXCONF_DEPLOY_HUP);
  EXPECT_EQ(0, repaired.run());
  EXPECT_EQ("0", ModeRecordText());
  EXPECT_EQ("/usr/local/etc/nginx/conf.d", LinkTarget("/etc/nginx/conf.d"));
}

TEST(DeployNginxHup, FailsWithoutTheGenerationLock) {
  DeployNormal();
  PretendNginxRuns();
  WriteModeRecord("0");
  WriteBytes("/usr/local/etc/nginx/conf.d/broken.conf", "bogus_directive on;\n");
  const Snapshot before = Take();
  ClearLog();
  {
    fault::Arm arm(1, fault::kOnce, EIO, fault::Op::kFlock);
    NginxConfManager manager(NGINXCONF_DEPLOY_HUP);
    EXPECT_EQ(-1, manager.run());
    EXPECT_TRUE(arm.fired());
    EXPECT_EQ("", manager.GetMsg());
  }
  EXPECT_EQ(Lines{"nginx_deploy:918 Failed to get genente nginx config lock."},
            TaggedLogMessages("nginx_deploy"));
  EXPECT_TRUE(before == Take());
}

}  // namespace
}  // namespace tavow3::test
