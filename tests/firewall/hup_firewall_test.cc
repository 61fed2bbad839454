// HupFirewall: the notifications that publish saved service files and reload
// the firewall, as the firewall tool sees them.
#include <syslog.h>

#include <filesystem>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "engine_test_util.h"
#include "support/fake_tools.h"
#include "support/syslog_capture.h"

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
    Calls calls;
  } cases[] = {
      {"no backup", {}, {reload}},
      {"system backup", {kSystemBackup}, {system, reload}},
      {"package backup", {kPackageBackup}, {package, reload}},
      {"both backups", {kSystemBackup, kPackageBackup}, {system, package, reload}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    ClearFakeCalls("tavofirewall");
    for (const std::string& backup : c.backups) WriteBytes(backup, "[old]\n");
    EXPECT_TRUE(Engine::HupFirewall());
    EXPECT_EQ(c.calls, FakeCalls("tavofirewall"));
    EXPECT_FALSE(Exists(kSystemBackup));
    EXPECT_FALSE(Exists(kPackageBackup));
  }
}

TEST(HupFirewall, ToolExitStatusIsNotAFailedNotification) {
  WriteBytes(kSystemBackup, "[old]\n");
  SetFakeExit("tavofirewall", 3);
  ClearLog();
  EXPECT_TRUE(Engine::HupFirewall());
  EXPECT_FALSE(Exists(kSystemBackup));
  EXPECT_EQ(2u, FakeCalls("tavofirewall").size());
  EXPECT_TRUE(LogMessages(LOG_ERR).empty());
}

// A notification fails when the tool cannot report at all: it dies by a signal.
void InstallDyingTool(const std::string& condition) {
  WriteBytes(kTool, "#!/bin/sh\nif " + condition + "; then kill -KILL $$; fi\nexit 0\n");
  std::filesystem::permissions(kTool, std::filesystem::perms(0755));
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
    EXPECT_EQ(c.system_backup_left, Exists(kSystemBackup));
    EXPECT_EQ(c.package_backup_left, Exists(kPackageBackup));
  }
}

TEST(HupFirewall, MissingToolFailsReload) {
  std::filesystem::remove(kTool);
  ClearLog();
  EXPECT_FALSE(Engine::HupFirewall());
  EXPECT_EQ(std::vector<std::string>{"engine:547 Failed to hup firewall"}, LogMessages(LOG_ERR));
}

}  // namespace
}  // namespace tavow3::test
