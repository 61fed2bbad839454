#include <fcntl.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include <tavow3/nginx_mode_recorder.h>

#include "base/fault.h"
#include "deploy/alert_delay.h"
#include "support/fake_tools.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::test {
namespace {

constexpr char kFlag[] = "/run/tavow3/force_default";
const std::vector<std::string> kAlert = {"@administrators", "zamnotify:system_event",
                                         "widget:apache_statup_failed"};

size_t Alerts() { return FakeCalls("tavozamnotify").size(); }

// Makes this process the reaper of its orphaned descendants, so that the
// detached alert process becomes its child and its end can be waited for.
void AdoptOrphans() { ASSERT_EQ(0, ::prctl(PR_SET_CHILD_SUBREAPER, 1, 0, 0, 0)); }

// Waits for every adopted alert process to end; how many there were.
int ReapAlertProcesses() {
  int reaped = 0;
  WaitUntil(
      [&] {
        int status = 0;
        const pid_t pid = ::waitpid(-1, &status, WNOHANG);
        if (pid > 0) {
          ++reaped;
          EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << status;
        }
        return pid < 0 && errno == ECHILD;
      },
      std::chrono::seconds(30));
  return reaped;
}

void WriteRecord(const char* text) {
  std::string bytes(4096, '\0');
  bytes.replace(0, std::string(text).size(), text);
  WriteBytes("/dev/shm/nginx_mod", bytes);
}

TEST(EmitAlert, DefaultNotifiesAtOnceWithoutForking) {
  base::fault::Arm no_fork(1, base::fault::kPersistent, EAGAIN, base::fault::Op::kFork);
  NginxModeRecorder::EmitAlert(NGINXCONF_DEFAULT);
  EXPECT_EQ(std::vector<std::vector<std::string>>{kAlert}, FakeCalls("tavozamnotify"));
  // Recording Default alerts synchronously too, the flag being absent.
  EXPECT_TRUE(NginxModeRecorder::RecordMode(NGINXCONF_DEFAULT));
  EXPECT_EQ(2u, Alerts());
  EXPECT_FALSE(no_fork.fired());
  // Asked directly, Default notifies even while the flag exists.
  WriteBytes(kFlag, "");
  NginxModeRecorder::EmitAlert(NGINXCONF_DEFAULT);
  EXPECT_EQ(3u, Alerts());
}

TEST(EmitAlert, DelayedAlertLooksAtTheRecordAndTheFlagAgain) {
  AdoptOrphans();
  deploy::SetAlertDelayForTesting(0);
  const struct {
    const char* name;
    const char* record;  // null: no record
    bool flag;
    size_t alerts;
  } cases[] = {
      {"still abnormal", "1", false, 1},
      {"now default", "2", false, 1},
      {"back to normal", "0", false, 0},
      {"no record", nullptr, false, 1},
      {"bad record", "10", false, 1},
      {"forced default", "1", true, 0},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    ClearFakeCalls("tavozamnotify");
    ::unlink("/dev/shm/nginx_mod");
    if (c.record != nullptr) WriteRecord(c.record);
    ::unlink(kFlag);
    if (c.flag) WriteBytes(kFlag, "");
    NginxModeRecorder::EmitAlert(NGINXCONF_ABNORMAL);
    EXPECT_EQ(1, ReapAlertProcesses());
    EXPECT_EQ(c.alerts, Alerts());
    if (c.alerts > 0) {
      EXPECT_EQ(kAlert, FakeCalls("tavozamnotify").back());
    }
  }
}

TEST(EmitAlert, RecordingAFallBackAlertsAfterTheDelayUnlessForced) {
  AdoptOrphans();
  deploy::SetAlertDelayForTesting(0);
  EXPECT_TRUE(NginxModeRecorder::RecordMode(NGINXCONF_ABNORMAL));
  EXPECT_EQ(1, ReapAlertProcesses());
  EXPECT_EQ(1u, Alerts());

  // Normal raises nothing; with the flag no alert process is even started.
  EXPECT_TRUE(NginxModeRecorder::RecordMode(NGINXCONF_NORMAL));
  WriteBytes(kFlag, "");
  EXPECT_TRUE(NginxModeRecorder::RecordMode(NGINXCONF_ABNORMAL));
  EXPECT_TRUE(NginxModeRecorder::RecordMode(NGINXCONF_DEFAULT));
  EXPECT_EQ(0, ReapAlertProcesses());
  EXPECT_EQ(1u, Alerts());
}

TEST(EmitAlert, WaitsOutTheRealDelayWithoutBlockingTheCaller) {
  EXPECT_TRUE(NginxModeRecorder::RecordMode(NGINXCONF_ABNORMAL));
  // The caller is back while the alert process still sleeps.
  EXPECT_EQ(0u, Alerts());
  EXPECT_TRUE(WaitUntil([] { return Alerts() == 1; }, std::chrono::seconds(60)));
  EXPECT_EQ(std::vector<std::vector<std::string>>{kAlert}, FakeCalls("tavozamnotify"));
}

TEST(EmitAlert, FailedForksAlertAtOnce) {
  deploy::SetAlertDelayForTesting(3600);
  WriteRecord("1");
  const struct {
    const char* name;
    int failing_fork;
    const char* log;
  } cases[] = {
      {"first fork", 1, "nginx_deploy:687 Failed to fork process, emit alert immediately"},
      {"second fork", 2, "nginx_deploy:694 Failed to fork process, emit alert immediately"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    ClearFakeCalls("tavozamnotify");
    ClearLog();
    {
      base::fault::Arm arm(c.failing_fork, base::fault::kOnce, EAGAIN, base::fault::Op::kFork);
      NginxModeRecorder::EmitAlert(NGINXCONF_ABNORMAL);
    }
    // Sent before EmitAlert returned: by this process or by the waited-for child.
    EXPECT_EQ(std::vector<std::vector<std::string>>{kAlert}, FakeCalls("tavozamnotify"));
    EXPECT_EQ(std::vector<std::string>{c.log}, TaggedLogMessages("nginx_deploy"));
  }
  EXPECT_TRUE(ChildrenInState(0).empty());
}

TEST(EmitAlert, LeavesNoZombieAndNoChild) {
  deploy::SetAlertDelayForTesting(3600);
  for (int i = 0; i < 3; ++i) NginxModeRecorder::EmitAlert(NGINXCONF_ABNORMAL);
  EXPECT_TRUE(ChildrenInState('Z').empty());
  EXPECT_TRUE(ChildrenInState(0).empty());
  EXPECT_EQ(0u, Alerts());
}

TEST(EmitAlert, AlertProcessDoesNotKeepTheCallersLock) {
  AdoptOrphans();
  deploy::SetAlertDelayForTesting(3600);
  // A lock that its holder drops by closing the descriptor, as the engine does.
  constexpr char kLock[] = "/run/lock/tavow3.lock";
  const int held = ::open(kLock, O_RDONLY | O_CREAT | O_CLOEXEC, 0444);
  ASSERT_GE(held, 0);
  ASSERT_EQ(0, ::flock(held, LOCK_EX));
  NginxModeRecorder::EmitAlert(NGINXCONF_ABNORMAL);
  ::close(held);
  const bool freed = WaitUntil([&] {
    const int fd = ::open(kLock, O_RDONLY | O_CLOEXEC);
    const bool free = fd >= 0 && ::flock(fd, LOCK_EX | LOCK_NB) == 0;
    if (fd >= 0) ::close(fd);
    return free;
  });
  EXPECT_TRUE(freed);
  const std::vector<pid_t> alert_processes = ChildrenInState(0);
  EXPECT_EQ(1u, alert_processes.size());
  for (pid_t pid : alert_processes) ::kill(pid, SIGKILL);
  for (pid_t pid : alert_processes) ::waitpid(pid, nullptr, 0);
}

}  // namespace
}  // namespace tavow3::test
