#include "tavo/tlib_service.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <string>
#include <vector>

#include "support/fake_tools.h"
#include "support/test_files.h"

namespace {

using tavow3::test::FreshDir;
using tavow3::test::Lines;
using tavow3::test::ReadBytes;
using tavow3::test::WriteBytes;

constexpr char kScript[] = "/usr/tavo/etc/rc.sysv/demo.sh";

void WriteScript(const std::string& body) {
  WriteBytes(kScript, "#!/bin/sh\nprintf '%s\\n' \"$#\" \"$@\" > /tmp/demo.args\n" + body, 0755);
}

TEST(TLIBServiceReload, RunsTheScriptWithReload) {
  struct Case {
    const char* body;
    int result;
  } cases[] = {{"exit 0\n", 0}, {"exit 4\n", 4}, {"kill -KILL $$\n", -1}};
  for (const Case& c : cases) {
    SCOPED_TRACE(c.body);
    ::unlink("/tmp/demo.args");
    WriteScript(c.body);
    EXPECT_EQ(c.result, TLIBServiceReload("demo"));
    EXPECT_EQ((std::vector<std::string>{"1", "reload"}), Lines(ReadBytes("/tmp/demo.args")));
  }
  ::unlink(kScript);
  errno = 0;
  EXPECT_EQ(-1, TLIBServiceReload("demo"));
  EXPECT_EQ(ENOENT, errno);
  for (const char* name : {static_cast<const char*>(nullptr), "", "..", "../rc.sysv/demo"}) {
    SCOPED_TRACE(name ? name : "(null)");
    errno = 0;
    EXPECT_EQ(-1, TLIBServiceReload(name));
    EXPECT_EQ(EINVAL, errno);
  }
}

TEST(TLIBServicectlStatus, PidFileNamesALivingProcess) {
  ::unlink("/run/demo.pid");
  pid_t exited = ::fork();
  if (exited == 0) ::_exit(0);
  ASSERT_LT(0, exited);
  // Exited but not reaped: a zombie.
  siginfo_t info;
  ASSERT_EQ(0, ::waitid(P_PID, exited, &info, WEXITED | WNOWAIT));
  const std::string self = std::to_string(::getpid());
  struct Case {
    const char* content;  // null: no pid file
    int pid;
    int state;
  } cases[] = {
      {nullptr, 0, TLIB_SERVICE_STOPPED},
      {"", 0, TLIB_SERVICE_STOPPED},
      {"garbage\n", 0, TLIB_SERVICE_STOPPED},
      {"12abc\n", 0, TLIB_SERVICE_STOPPED},
      {"-1\n", 0, TLIB_SERVICE_STOPPED},
      {"0\n", 0, TLIB_SERVICE_STOPPED},
      {"99999999999\n", 0, TLIB_SERVICE_STOPPED},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.content ? c.content : "(no file)");
    if (c.content) WriteBytes("/run/demo.pid", c.content);
    int pid = -7;
    int state = -7;
    EXPECT_EQ(0, TLIBServicectlStatus("demo", &pid, &state));
    EXPECT_EQ(c.pid, pid);
    EXPECT_EQ(c.state, state);
  }
  struct PidCase {
    std::string content;
    int pid;
    int state;
  } pid_cases[] = {
      {self + "\n", ::getpid(), TLIB_SERVICE_RUNNING},
      {"  " + self + "  \n", ::getpid(), TLIB_SERVICE_RUNNING},
      {std::to_string(exited) + "\n", 0, TLIB_SERVICE_STOPPED},
  };
  for (const PidCase& c : pid_cases) {
    SCOPED_TRACE(c.content);
    WriteBytes("/run/demo.pid", c.content);
    int pid = -7;
    int state = -7;
    EXPECT_EQ(0, TLIBServicectlStatus("demo", &pid, &state));
    EXPECT_EQ(c.pid, pid);
    EXPECT_EQ(c.state, state);
  }
  ASSERT_EQ(exited, ::waitpid(exited, nullptr, 0));
  int pid = -7;
  int state = -7;
  EXPECT_EQ(0, TLIBServicectlStatus("demo", &pid, &state));  // reaped: gone
  EXPECT_EQ(TLIB_SERVICE_STOPPED, state);
}

TEST(TLIBServicectlStatus, FailuresLeaveOutputsUnchanged) {
  ::unlink("/run/demo.pid");
  FreshDir("/run/demo.pid");
  int pid = -7;
  int state = -7;
  errno = 0;
  EXPECT_EQ(-1, TLIBServicectlStatus("demo", &pid, &state));
  EXPECT_EQ(EISDIR, errno);
  for (const char* name : {static_cast<const char*>(nullptr), "", "a/b", ".."}) {
    SCOPED_TRACE(name ? name : "(null)");
    errno = 0;
    EXPECT_EQ(-1, TLIBServicectlStatus(name, &pid, &state));
    EXPECT_EQ(EINVAL, errno);
  }
  EXPECT_EQ(-1, TLIBServicectlStatus("nginx", nullptr, &state));
  EXPECT_EQ(-1, TLIBServicectlStatus("nginx", &pid, nullptr));
  EXPECT_EQ(-7, pid);
  EXPECT_EQ(-7, state);
  ::rmdir("/run/demo.pid");
}

TEST(TLIBServiceConfServNotify, RunsTheFirewallTool) {
  using tavow3::test::FakeCalls;
  tavow3::test::ClearFakeCalls("tavofirewall");
  TLIB_SERVCONF_NOTIFY both = {"/var/tmp/tavow3/tavow3.sc", "/usr/tavo/etc/services.d/tavow3.sc",
                               0, 1};
  TLIB_SERVCONF_NOTIFY only_new = {nullptr, "/usr/tavo/etc/services.d/tavow3.sc", 1, 0};
  TLIB_SERVCONF_NOTIFY reload = {nullptr, nullptr, 1, 0};
  EXPECT_EQ(0, TLIBServiceConfServNotify(&both));
  EXPECT_EQ(0, TLIBServiceConfServNotify(&only_new));
  tavow3::test::SetFakeExit("tavofirewall", 3);
  EXPECT_EQ(3, TLIBServiceConfServNotify(&reload));
  tavow3::test::SetFakeExit("tavofirewall", 0);
  EXPECT_EQ((std::vector<std::vector<std::string>>{
                {"--reload", "/var/tmp/tavow3/tavow3.sc", "/usr/tavo/etc/services.d/tavow3.sc"},
                {"--reload"},
                {"--reload"}}),
            FakeCalls("tavofirewall"));
  errno = 0;
  EXPECT_EQ(-1, TLIBServiceConfServNotify(nullptr));
  EXPECT_EQ(EINVAL, errno);
  ASSERT_EQ(0, ::unlink("/usr/tavo/bin/tavofirewall"));
  EXPECT_EQ(-1, TLIBServiceConfServNotify(&reload));
}

}  // namespace
