// The test-support library inside a sandbox: log lines read back from the
// real /dev/log sink and argument vectors recorded by the fake tools.
#include <errno.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <cstring>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "base/log.h"
#include "support/fake_tools.h"
#include "support/syslog_capture.h"

extern char** environ;

namespace tavow3::test {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr char kLogTag[] = "engine";

// Sends one raw datagram to /dev/log, as a syslog client other than glibc may.
void SendRaw(const std::string& datagram) {
  int fd = ::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  ASSERT_GE(fd, 0);
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::strcpy(address.sun_path, "/dev/log");
  ssize_t sent = ::sendto(fd, datagram.data(), datagram.size(), 0,
                          reinterpret_cast<sockaddr*>(&address), sizeof address);
  ::close(fd);
  ASSERT_EQ(static_cast<ssize_t>(datagram.size()), sent) << std::strerror(errno);
}

// Runs `path` with exactly `argv` (argv[0] included) and returns its exit code.
int RunFake(const std::string& path, const std::vector<std::string>& argv) {
  std::vector<char*> args;
  for (const std::string& arg : argv) args.push_back(const_cast<char*>(arg.c_str()));
  args.push_back(nullptr);
  pid_t pid = 0;
  if (::posix_spawn(&pid, path.c_str(), nullptr, nullptr, args.data(), environ) != 0) return -1;
  int status = 0;
  if (::waitpid(pid, &status, 0) != pid || !WIFEXITED(status)) return -1;
  return WEXITSTATUS(status);
}

std::string FakePath(const std::string& tool) { return "/usr/tavo/bin/" + tool; }

TEST(LogMessages, KeepsEachPriorityApart) {
  const int priorities[] = {LOG_EMERG,   LOG_ALERT,  LOG_CRIT, LOG_ERR,
                            LOG_WARNING, LOG_NOTICE, LOG_INFO, LOG_DEBUG};
  for (int priority : priorities) ::syslog(priority, "message at %d", priority);
  ::syslog(LOG_DAEMON | LOG_ERR, "daemon facility");
  std::vector<std::string> all = LogMessages();
  ASSERT_EQ(9u, all.size());
  EXPECT_EQ("message at 0", all.front());
  EXPECT_EQ("daemon facility", all.back());
  for (int priority : priorities) {
    SCOPED_TRACE(testing::Message() << "priority " << priority);
    std::vector<std::string> expected = {"message at " + std::to_string(priority)};
    if (priority == LOG_ERR) expected.push_back("daemon facility");
    EXPECT_EQ(expected, LogMessages(priority));
  }
}

TEST(LogMessages, ReturnsTheLibraryLineWithoutTheHeader) {
  base::Log(LOG_ERR, kLogTag, 317, "Runtime port %d conflict for %s", 80, "nginx");
  TAVOW3_LOG_ERR_AT(42, "with: a colon");
  EXPECT_THAT(LogMessages(LOG_ERR), ElementsAre("engine:317 Runtime port 80 conflict for nginx",
                                                "engine:42 with: a colon"));
}

TEST(LogMessages, KeepsAwkwardTextWhole) {
  const std::vector<std::string> texts = {"two\nlines",          "back\\slash and \\n literally",
                                          "trailing space ",     "ünïcødé ✓",
                                          "x: looks like a tag", "tab\there",
                                          std::string(3000, 'w')};
  for (const std::string& text : texts) ::syslog(LOG_WARNING, "%s", text.c_str());
  EXPECT_EQ(texts, LogMessages(LOG_WARNING));
}

TEST(LogMessages, ParsesHeadersOfOtherClients) {
  const struct {
    std::string datagram;
    int priority;
    std::string message;
  } cases[] = {
      {"<11>Nov  2 03:04:05 tool[99]: with pid", LOG_ERR, "with pid"},
      {"<12>Dec 31 23:59:59 tool: no pid", LOG_WARNING, "no pid"},
      {"<13>Jan  1 00:00:00 no tag here: keep it all", LOG_NOTICE, "no tag here: keep it all"},
      {"<14>no timestamp", LOG_INFO, "no timestamp"},
      {"<191>Feb 28 12:00:00 t: highest pri", LOG_DEBUG, "highest pri"},
      {"not syslog at all", -1, "not syslog at all"},
  };
  for (const auto& c : cases) SendRaw(c.datagram);
  std::vector<std::string> all = LogMessages();
  ASSERT_EQ(std::size(cases), all.size());
  for (size_t i = 0; i < all.size(); ++i) {
    SCOPED_TRACE(cases[i].datagram);
    EXPECT_EQ(cases[i].message, all[i]);
    if (cases[i].priority >= 0) {
      EXPECT_THAT(LogMessages(cases[i].priority), testing::Contains(cases[i].message));
    }
  }
}

TEST(LogMessages, SeesEveryLineOfABurstAndOfChildProcesses) {
  constexpr int kLines = 500;  // far more than the socket's datagram queue
  pid_t child = ::fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    for (int i = 0; i < kLines; ++i) ::syslog(LOG_INFO, "child %d", i);
    ::_exit(0);
  }
  int status = 0;
  ASSERT_EQ(child, ::waitpid(child, &status, 0));
  std::vector<std::string> lines = LogMessages(LOG_INFO);
  ASSERT_EQ(static_cast<size_t>(kLines), lines.size());
  for (int i = 0; i < kLines; ++i) EXPECT_EQ("child " + std::to_string(i), lines[i]);
}

TEST(ClearLog, ForgetsOnlyWhatCameBefore) {
  ::syslog(LOG_ERR, "before");
  ClearLog();
  EXPECT_THAT(LogMessages(), IsEmpty());
  ::syslog(LOG_ERR, "after");
  EXPECT_THAT(LogMessages(), ElementsAre("after"));
  EXPECT_THAT(LogMessages(LOG_ERR), ElementsAre("after"));
}

TEST(FakeCalls, RecordsAwkwardArgumentsExactly) {
  const std::vector<std::string> args = {"",
                                         "quote\"d",
                                         "new\nline",
                                         "back\\slash",
                                         "ünïcødé ✓",
                                         "\xff\xfe not UTF-8",
                                         "tab\tand\rreturn",
                                         "--check-all-folders",
                                         "[\"json\",1]",
                                         std::string(5000, 'a')};
  std::vector<std::string> argv = {"any-argv0"};
  argv.insert(argv.end(), args.begin(), args.end());
  EXPECT_EQ(0, RunFake(FakePath("tavouserhome"), argv));
  EXPECT_EQ(0, RunFake(FakePath("tavouserhome"), {"tavouserhome"}));
  EXPECT_EQ((std::vector<std::vector<std::string>>{args, {}}), FakeCalls("tavouserhome"));
}

TEST(FakeCalls, KeepsEachToolApart) {
  const char* tools[] = {"tavocrtregister", "tavocrtunregister", "tavozamnotify",
                         "tavofirewall",    "tavouserhome",      "tavopkgctl"};
  for (const char* tool : tools) EXPECT_EQ(0, RunFake(FakePath(tool), {tool, tool}));
  for (const char* tool : tools) {
    SCOPED_TRACE(tool);
    EXPECT_EQ((std::vector<std::vector<std::string>>{{tool}}), FakeCalls(tool));
  }
  ClearFakeCalls("tavofirewall");
  EXPECT_THAT(FakeCalls("tavofirewall"), IsEmpty());
  EXPECT_EQ(1u, FakeCalls("tavopkgctl").size());
  ClearFakeCalls("tavofirewall");  // nothing left to forget
}

TEST(FakeCalls, KeepsConcurrentRunsWhole) {
  constexpr int kProcesses = 6;
  constexpr int kRunsEach = 40;
  const std::string long_arg(3000, 'z');  // one line well past a pipe buffer's atomic size
  std::vector<pid_t> children;
  for (int p = 0; p < kProcesses; ++p) {
    pid_t child = ::fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
      for (int i = 0; i < kRunsEach; ++i) {
        if (RunFake(FakePath("tavozamnotify"), {"tavozamnotify", std::to_string(p), long_arg}) !=
            0) {
          ::_exit(1);
        }
      }
      ::_exit(0);
    }
    children.push_back(child);
  }
  for (pid_t child : children) {
    int status = 0;
    ASSERT_EQ(child, ::waitpid(child, &status, 0));
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
  }
  std::vector<std::vector<std::string>> calls = FakeCalls("tavozamnotify");
  ASSERT_EQ(static_cast<size_t>(kProcesses * kRunsEach), calls.size());
  for (const auto& call : calls) {
    ASSERT_EQ(2u, call.size());
    EXPECT_EQ(long_arg, call[1]);
  }
}

TEST(SetFakeExit, SetsTheStatusOfOneTool) {
  for (int status : {1, 2, 42, 255, 0}) {
    SCOPED_TRACE(status);
    SetFakeExit("tavocrtregister", status);
    EXPECT_EQ(status, RunFake(FakePath("tavocrtregister"), {"tavocrtregister", "sub", "svc"}));
    EXPECT_EQ(0, RunFake(FakePath("tavocrtunregister"), {"tavocrtunregister"}));
  }
  // A failing run is still recorded.
  EXPECT_EQ(5u, FakeCalls("tavocrtregister").size());
}

}  // namespace
}  // namespace tavow3::test
