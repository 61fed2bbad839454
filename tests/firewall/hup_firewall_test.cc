// HupFirewall: the notifications that publish saved service files and reload
// the firewall, as the firewall tool sees them.
#include <syslog.h>
#include <unistd.h>

#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <tavow3/engine.h>

#include "support/fake_tools.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"

namespace tavow3::test {
namespace {

using Calls = std::vector<std::vector<std::string>>;

constexpr char kTool[] = "/usr/tavo/bin/tavofirewall";
constexpr char kSystemBackup[] = "/var/tmp/tavow3/tavow3.sc";
constexpr char kPackageBackup[] = "/var/tmp/tavow3/Pagora.sc";
constexpr char kSystemFile[] = "/usr/tavo/etc/services.d/tavow3.sc";
constexpr char kPackageFile[] = "/usr/local/etc/services.d/Pagora.sc";

TEST(HupFirewall, NotifiesEachBackupThenReloads) {
  const std::vector<std::string> reload = {"--reload"};
  const std::vector<std::string> system = {"--reload", kSystemBackup, kSystemFile};
  const std::vector<std::string> package = {"--reload", kPackageBackup, kPackageFile};
  struct Case {
    const char* name;
    std::vector<std::string> backups;
    int tool_exit;  // an exit status is no failed notification
    Calls calls;
  } cases[] = {
      {"no backup", {}, 0, {reload}},
      {"system backup", {kSystemBackup}, 0, {system, reload}},
      {"package backup", {kPackageBackup}, 0, {package, reload}},
      {"both backups", {kSystemBackup, kPackageBackup}, 0, {system, package, reload}},
      {"tool exits 3", {kSystemBackup}, 3, {system, reload}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    ClearFakeCalls("tavofirewall");
    SetFakeExit("tavofirewall", c.tool_exit);
    for (const std::string& backup : c.backups) WriteBytes(backup, "[old]\n");
    ClearLog();
    EXPECT_TRUE(Engine::HupFirewall());
    EXPECT_EQ(c.calls, FakeCalls("tavofirewall"));
    EXPECT_FALSE(PathExists(kSystemBackup));
    EXPECT_FALSE(PathExists(kPackageBackup));
    EXPECT_EQ(std::vector<std::string>{}, LogMessages(LOG_ERR));
  }
}

// A notification fails when the tool cannot report at all: it dies by a signal.
void InstallDyingTool(const std::string& condition) {
  WriteBytes(kTool, "#!/bin/sh\nif " + condition + "; then kill -KILL $$; fi\nexit 0\n", 0755);
}

TEST(HupFirewall, StopsAtFirstFailedNotificationKeepingLaterBackups) {
  struct Case {
    const char* name;
    const char* condition;
    bool system_backup_left, package_backup_left;
    const char* log_line;
  } cases[] = {
      {"system update fails", "true", true, true, "engine:523 Failed to update tavow3 portforward"},
      {"package update fails", "[ \"$3\" = /usr/local/etc/services.d/Pagora.sc ]", false, true,
       "engine:538 Failed to update pagora portforward"},
      {"reload fails", "[ $# -eq 1 ]", false, false, "engine:547 Failed to hup firewall"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    InstallDyingTool(c.condition);
    WriteBytes(kSystemBackup, "[old system]\n");
    WriteBytes(kPackageBackup, "[old package]\n");
    ClearLog();
    EXPECT_FALSE(Engine::HupFirewall());
    EXPECT_EQ(std::vector<std::string>{c.log_line}, LogMessages(LOG_ERR));
    EXPECT_EQ(c.system_backup_left, PathExists(kSystemBackup));
    EXPECT_EQ(c.package_backup_left, PathExists(kPackageBackup));
  }
}

TEST(HupFirewall, MissingToolFailsReload) {
  ASSERT_EQ(0, ::unlink(kTool));
  ClearLog();
  EXPECT_FALSE(Engine::HupFirewall());
  EXPECT_EQ(std::vector<std::string>{"engine:547 Failed to hup firewall"}, LogMessages(LOG_ERR));
}

}  // namespace
}  // namespace tavow3::test
