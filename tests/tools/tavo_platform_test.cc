// tavo-platform, the command-line face of the platform API, as the demo and
// an administrator use it: argv in, output and exit status out, inside a
// sandboxed appliance.
#include <sys/wait.h>
#include <unistd.h>

#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/test_files.h"
#include "support/test_process.h"

namespace {

using ::testing::HasSubstr;
using ::testing::Not;
using Result = tavow3::test::RunResult;
using tavow3::test::RunCommand;
using tavow3::test::WriteBytes;

constexpr char kProgram[] = "/usr/tavo/bin/tavo-platform";

Result Tool(const std::vector<std::string>& args) {
  std::vector<std::string> argv = {kProgram};
  argv.insert(argv.end(), args.begin(), args.end());
  return RunCommand(argv);
}

TEST(TavoPlatform, BadArgumentsExitTwoWithoutCallingThePlatform) {
  const std::vector<std::vector<std::string>> cases = {
      {},
      {"nope"},
      {"exec"},
      {"popen"},
      {"fw-status"},
      {"fw-load", "A", "B"},
      {"tls-list", "extra"},
      {"tls-level"},
      {"tls-level", "zam", "x"},
      {"tls-level", "zam", "-1"},
      {"tls-level", "zam", "3", "4"},
      {"sc-read"},
      {"port-conflict", "80"},
      {"service-status"},
  };
  for (const auto& args : cases) {
    SCOPED_TRACE(testing::PrintToString(args));
    Result result = Tool(args);
    EXPECT_EQ(2, result.status);
    EXPECT_EQ("", result.out);
    EXPECT_THAT(result.err, HasSubstr("tavo-platform"));
  }
  // A refused level change leaves the store's level alone.
  EXPECT_EQ("zam: level 2\n", Tool({"tls-level", "zam"}).out);

  Result help = Tool({"help"});
  EXPECT_EQ(0, help.status);
  for (const char* command : {"exec", "popen", "fw-status", "fw-load", "fw-unload", "tls-list",
                              "tls-level", "sc-read", "port-conflict", "service-status"}) {
    EXPECT_THAT(help.out, HasSubstr(std::string("\n  ") + command + " "));
  }
}

TEST(TavoPlatform, ExecPassesArgumentsVerbatimAndReportsTheExitStatus) {
  struct Case {
    std::vector<std::string> args;
    int status;
    std::string out;
  };
  const std::string script = "printf '<%s>' \"$@\"; exit \"$1\"";
  const std::vector<Case> cases = {
      {{"exec", "/usr/bin/printf", "<%s>", "a b", "", "$HOME;x"},
       0, "<a b><><$HOME;x>TLIBCExec: /usr/bin/printf exited with status 0\n"},
      {{"exec", "/bin/sh", "-c", script, "sh", "7", "", "c d"},
       1, "<7><><c d>TLIBCExecl: /bin/sh exited with status 7\n"},
      {{"exec", "/usr/bin/printf", "<%s>", "1", "2", "3", "4"},
       0, "<1><2><3><4>TLIBCExecl: /usr/bin/printf exited with status 0\n"},
      {{"exec", "/bin/sh", "-c", "printf '<%s>' \"$0\"; exit 5", "zero"},
       1, "<zero>TLIBCExec: /bin/sh exited with status 5\n"},
      {{"exec", "/nonexistent/program"},
       3, "TLIBCExec: /nonexistent/program could not run or was killed by a signal\n"},
      {{"popen", "/bin/sh", "-c", "echo out; echo err >&2; exit 4"},
       1, "| out\n| err\nTLIBCPclose: /bin/sh exited with status 4\n"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(testing::PrintToString(c.args));
    Result result = Tool(c.args);
    EXPECT_EQ(c.status, result.status);
    EXPECT_EQ(c.out, result.out);
  }
}

TEST(TavoPlatform, FirewallModuleSetLoadsAndUnloadsInIptables) {
  const std::string set = "ZAM_DEFAULT_SERVICE";
  Result before = Tool({"fw-status", set});
  EXPECT_EQ(1, before.status);
  EXPECT_EQ(set + ": not loaded\n", before.out);

  EXPECT_EQ(0, Tool({"fw-load", set}).status);
  std::string rules = RunCommand({"/usr/bin/iptables", "-S"}).out;
  EXPECT_THAT(rules, HasSubstr("-N ZAM_DEFAULT_FORWARD\n"));
  EXPECT_THAT(rules, HasSubstr("-A INPUT -j ZAM_DEFAULT_FORWARD\n"));
  Result loaded = Tool({"fw-status", set});
  EXPECT_EQ(0, loaded.status);
  EXPECT_EQ(set + ": loaded\n", loaded.out);

  EXPECT_EQ(0, Tool({"fw-unload", set}).status);
  EXPECT_THAT(RunCommand({"/usr/bin/iptables", "-S"}).out, Not(HasSubstr("ZAM_DEFAULT_FORWARD")));
  EXPECT_EQ(1, Tool({"fw-status", set}).status);

  Result unknown = Tool({"fw-load", "NO_SUCH_SET"});
  EXPECT_EQ(3, unknown.status);
  EXPECT_THAT(unknown.err, HasSubstr("NO_SUCH_SET"));
}

TEST(TavoPlatform, TlsLevelsGoThroughTheStore) {
  EXPECT_EQ("zam                      level 2  ZAM\n", Tool({"tls-list"}).out);

  Result set = Tool({"tls-level", "zam", "3"});
  EXPECT_EQ(0, set.status);
  EXPECT_EQ("zam: level 3\n", set.out);
  EXPECT_THAT(Tool({"tls-list"}).out, HasSubstr("zam                      level 3"));

  Result refused = Tool({"tls-level", "zam", "4"});
  EXPECT_EQ(3, refused.status);
  EXPECT_EQ("", refused.out);
  EXPECT_EQ("zam: level 3\n", Tool({"tls-level", "zam"}).out);

  Result missing = Tool({"tls-level", "nobody"});
  EXPECT_EQ(1, missing.status);
  EXPECT_EQ("nobody: not registered\n", missing.out);
  EXPECT_EQ(0, Tool({"tls-level", "nobody", "1"}).status);
  EXPECT_EQ("nobody: level 1\n", Tool({"tls-level", "nobody"}).out);
}

TEST(TavoPlatform, ServiceFilesAndPortLists) {
  WriteBytes("/tmp/demo.sc",
            "[ZAM_5000]\ntitle=\"HTTP\"\ndesc=\"Z \\\"A\\\" \\\\M\"\nports=\"5000,8000:8010\"\n"
            "protocol=\"tcp\"\n\n[extra]\nports=\"53\"\nprotocol=\"udp\"\n");
  Result read = Tool({"sc-read", "/tmp/demo.sc"});
  EXPECT_EQ(0, read.status);
  EXPECT_EQ(
      "[ZAM_5000] ports=5000,8000:8010 protocol=tcp title=\"HTTP\" desc=\"Z \\\"A\\\" \\\\M\"\n"
      "[extra] ports=53 protocol=udp title=\"\" desc=\"\"\n"
      "2 sections, ports 5000,8000:8010,53\n",
      read.out);
  Result missing = Tool({"sc-read", "/tmp/missing.sc"});
  EXPECT_EQ(3, missing.status);
  EXPECT_THAT(missing.err, HasSubstr("/tmp/missing.sc: No such file or directory"));

  struct Case {
    std::vector<std::string> args;
    int status;
    std::string out;
  };
  const std::vector<Case> cases = {
      {{"5000,8000:8010", "80,8010,443,5000,7999"}, 0, "conflict: 5000 8010\n"},
      {{"5000,8000:8010", "80,443,8011"}, 1, "no conflict\n"},
      {{"53", "53", "udp"}, 0, "conflict: 53\n"},
      {{"5000,x", "80"}, 3, ""},
      {{"5000", "5000", "sctp"}, 3, ""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(testing::PrintToString(c.args));
    std::vector<std::string> args{"port-conflict"};
    args.insert(args.end(), c.args.begin(), c.args.end());
    Result result = Tool(args);
    EXPECT_EQ(c.status, result.status);
    EXPECT_EQ(c.out, result.out);
  }
}

TEST(TavoPlatform, ServiceStatusFollowsThePidFile) {
  WriteBytes("/run/demo.pid", std::to_string(getpid()) + "\n");
  Result running = Tool({"service-status", "demo"});
  EXPECT_EQ(0, running.status);
  EXPECT_EQ("demo: running (pid " + std::to_string(getpid()) + ")\n", running.out);

  pid_t gone = fork();
  if (gone == 0) _exit(0);
  ASSERT_EQ(gone, waitpid(gone, nullptr, 0));
  WriteBytes("/run/demo.pid", std::to_string(gone) + "\n");
  Result stopped = Tool({"service-status", "demo"});
  EXPECT_EQ(1, stopped.status);
  EXPECT_EQ("demo: stopped\n", stopped.out);
}

}  // namespace
