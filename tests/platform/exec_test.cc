#include "tavo/tlib_exec.h"

#include <fcntl.h>
#include <signal.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include "support/test_files.h"

namespace {

using tavow3::test::FreshDir;
using tavow3::test::Lines;
using tavow3::test::ReadBytes;
using tavow3::test::WriteBytes;

constexpr char kDir[] = "/tmp/exec";
constexpr char kRecorder[] = "/tmp/exec/record";
constexpr char kArgs[] = "/tmp/exec/args";

// A program that writes each of its arguments, bracketed, to kArgs.
void WriteRecorder() {
  FreshDir(kDir);
  WriteBytes(kRecorder,
             "#!/bin/sh\n: > /tmp/exec/args\n"
             "for a in \"$@\"; do printf '[%s]\\n' \"$a\" >> /tmp/exec/args; done\n",
             0755);
}

std::string ReadStream(FILE* stream) {
  std::string text;
  char buffer[512];
  size_t n;
  while ((n = std::fread(buffer, 1, sizeof buffer, stream)) > 0) text.append(buffer, n);
  return text;
}

TEST(TLIBCExec, ResultIsExitStatusOrMinusOne) {
  FreshDir(kDir);
  WriteBytes("/tmp/exec/plain", "not a program\n", 0644);
  WriteBytes("/tmp/exec/noshebang", "exit 0\n", 0755);
  struct Case {
    const char* path;
    const char* script;
    int result;
    int error;  // expected errno for -1 when the program could not start
  } cases[] = {
      {"/bin/sh", "exit 0", 0, 0},
      {"/bin/sh", "exit 3", 3, 0},
      {"/bin/sh", "exit 255", 255, 0},
      {"/bin/sh", "kill -KILL $$", -1, 0},
      {"/bin/sh", "kill -TERM $$", -1, 0},
      {"/nonexistent/program", nullptr, -1, ENOENT},
      {"/tmp/exec/plain", nullptr, -1, EACCES},
      {"/tmp/exec/noshebang", nullptr, -1, ENOEXEC},
      {"/tmp/exec", nullptr, -1, EACCES},
      {"", nullptr, -1, ENOENT},
      {nullptr, nullptr, -1, EINVAL},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(std::string(c.path ? c.path : "(null)") + " " + (c.script ? c.script : ""));
    errno = 0;
    int result = c.script ? TLIBCExec(c.path, "-c", c.script) : TLIBCExec(c.path);
    EXPECT_EQ(c.result, result);
    if (c.error != 0) {
      EXPECT_EQ(c.error, errno);
    }
  }
}

// A caller that ignores or blocks signals must not hand that on to its programs.
TEST(TLIBCExec, ProgramsStartWithDefaultSignals) {
  struct sigaction ignore = {};
  ignore.sa_handler = SIG_IGN;
  struct sigaction old_term;
  ASSERT_EQ(0, ::sigaction(SIGTERM, &ignore, &old_term));
  sigset_t blocked;
  sigset_t old_mask;
  sigemptyset(&blocked);
  sigaddset(&blocked, SIGUSR1);
  ASSERT_EQ(0, ::sigprocmask(SIG_BLOCK, &blocked, &old_mask));
  EXPECT_EQ(-1, TLIBCExec("/bin/sh", "-c", "kill -TERM $$; exit 0"));
  EXPECT_EQ(-1, TLIBCExec("/bin/sh", "-c", "kill -USR1 $$; exit 0"));
  const char* argv[] = {"/bin/sh", "-c", "kill -TERM $$; exit 0", nullptr};
  EXPECT_EQ(-1, TLIBCExecl(argv, 0xBB));
  FILE* stream = TLIBCPopen(argv, "r");
  ASSERT_NE(nullptr, stream);
  EXPECT_EQ(-1, TLIBCPclose(stream));
  ASSERT_EQ(0, ::sigprocmask(SIG_SETMASK, &old_mask, nullptr));
  ASSERT_EQ(0, ::sigaction(SIGTERM, &old_term, nullptr));
}

TEST(TLIBCExec, PassesArgumentsUpToTheFirstNull) {
  WriteRecorder();
  struct Case {
    const char* args[4];
    std::vector<std::string> recorded;
  } cases[] = {
      {{nullptr, nullptr, nullptr, nullptr}, {}},
      {{"", nullptr, nullptr, nullptr}, {"[]"}},
      {{"", "two words", "", nullptr}, {"[]", "[two words]", "[]"}},
      {{"a", "b", "c", "d"}, {"[a]", "[b]", "[c]", "[d]"}},
      {{"a", nullptr, "c", "d"}, {"[a]"}},
      {{"*", "$HOME", ";", "'\""}, {"[*]", "[$HOME]", "[;]", "['\"]"}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(testing::PrintToString(c.recorded));
    ASSERT_EQ(0, TLIBCExec(kRecorder, c.args[0], c.args[1], c.args[2], c.args[3]));
    EXPECT_EQ(c.recorded, Lines(ReadBytes(kArgs)));
  }
}

// Descriptor 7, open without close-on-exec, is what a careless caller leaks.
class LeakedDescriptor : public testing::Test {
 protected:
  void SetUp() override { ASSERT_EQ(7, ::dup2(STDERR_FILENO, 7)); }
  void TearDown() override { ::close(7); }
  static constexpr char kUsesFd7[] = "echo probe >&7";
};

TEST_F(LeakedDescriptor, OnlyExeclWithoutCloseFdsPassesIt) {
  EXPECT_NE(0, TLIBCExec("/bin/sh", "-c", kUsesFd7));
  const char* argv[] = {"/bin/sh", "-c", kUsesFd7, nullptr};
  EXPECT_EQ(0, TLIBCExecl(argv, TLIB_EXEC_WAIT | TLIB_EXEC_STATUS));
  EXPECT_NE(0, TLIBCExecl(argv, TLIB_EXEC_WAIT | TLIB_EXEC_STATUS | TLIB_EXEC_CLOSE_FDS));
  FILE* stream = TLIBCPopen(argv, "r");
  ASSERT_NE(nullptr, stream);
  ReadStream(stream);
  EXPECT_NE(0, TLIBCPclose(stream));
}

TEST(TLIBCExecl, FlagsSelectWaitStatusRedirectionsAndSession) {
  FreshDir(kDir);
  // Writes where its standard descriptors lead and whether it leads a session.
  const char* probe =
      "fds=$(readlink /proc/$$/fd/0 /proc/$$/fd/1 /proc/$$/fd/2); echo \"$fds\" > /tmp/exec/fds; "
      "[ \"$(cut -d' ' -f6 /proc/$$/stat)\" = \"$$\" ] && echo leader >> /tmp/exec/fds; exit 4";
  const char* argv[] = {"/bin/sh", "-c", probe, nullptr};
  std::vector<std::string> own;
  for (int fd = 0; fd < 3; ++fd) {
    own.push_back(std::filesystem::read_symlink("/proc/self/fd/" + std::to_string(fd)));
  }
  const std::vector<std::string> null3(3, "/dev/null");
  struct Case {
    unsigned int flags;
    int result;
    std::vector<std::string> fds;
    bool leader;
  } cases[] = {
      {0xBB, 4, null3, false},
      {TLIB_EXEC_WAIT, -1, own, false},
      {TLIB_EXEC_WAIT | TLIB_EXEC_STATUS, 4, own, false},
      {TLIB_EXEC_WAIT | TLIB_EXEC_STATUS | TLIB_EXEC_NULL_STDOUT, 4, {own[0], null3[1], own[2]},
       false},
      {TLIB_EXEC_WAIT | TLIB_EXEC_STATUS | TLIB_EXEC_NULL_STDIN | TLIB_EXEC_NULL_STDERR, 4,
       {null3[0], own[1], null3[2]}, false},
      {TLIB_EXEC_WAIT | TLIB_EXEC_STATUS | TLIB_EXEC_NEW_SESSION, 4, own, true},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(testing::Message() << "flags 0x" << std::hex << c.flags);
    EXPECT_EQ(c.result, TLIBCExecl(argv, c.flags));
    std::vector<std::string> fds = Lines(ReadBytes("/tmp/exec/fds"));
    std::vector<std::string> expected = c.fds;
    if (c.leader) expected.push_back("leader");
    EXPECT_EQ(expected, fds);
  }
  const char* exits_zero[] = {"/bin/sh", "-c", "exit 0", nullptr};
  EXPECT_EQ(0, TLIBCExecl(exits_zero, TLIB_EXEC_WAIT));
  const char* killed[] = {"/bin/sh", "-c", "kill -KILL $$", nullptr};
  EXPECT_EQ(-1, TLIBCExecl(killed, 0xBB));
}

TEST(TLIBCExecl, SearchPathOnlyWhenAsked) {
  const char* argv[] = {"sh", "-c", "exit 6", nullptr};
  errno = 0;
  EXPECT_EQ(-1, TLIBCExecl(argv, 0xBB));
  EXPECT_EQ(ENOENT, errno);
  EXPECT_EQ(6, TLIBCExecl(argv, 0xBB | TLIB_EXEC_SEARCH_PATH));
}

TEST(TLIBCExecl, RefusesBadArguments) {
  const char* argv[] = {"/bin/true", nullptr};
  const char* empty[] = {nullptr};
  struct Case {
    const char* const* argv;
    unsigned int flags;
  } cases[] = {{nullptr, 0xBB}, {empty, 0xBB}, {argv, 0x100}, {argv, 0xBB | 0x8000}};
  for (const Case& c : cases) {
    SCOPED_TRACE(testing::Message() << "flags " << c.flags);
    errno = 0;
    EXPECT_EQ(-1, TLIBCExecl(c.argv, c.flags));
    EXPECT_EQ(EINVAL, errno);
  }
}

TEST(TLIBCExecl, WithoutWaitReturnsOnceStarted) {
  FreshDir(kDir);
  const char* argv[] = {"/bin/sh", "-c", "echo started > /tmp/exec/started; exit 9", nullptr};
  ASSERT_EQ(0, TLIBCExecl(argv, TLIB_EXEC_NULL_STDIN | TLIB_EXEC_STATUS));
  // The child is left to the caller; reaping it shows that it ran.
  int status = 0;
  ASSERT_LT(0, ::waitpid(-1, &status, 0));
  EXPECT_EQ(9, WEXITSTATUS(status));
  EXPECT_EQ("started\n", ReadBytes("/tmp/exec/started"));
}

TEST(TLIBCPopen, ReadsOutputAndReportsStatus) {
  const char* script = "echo out; echo err >&2; exit 3";
  const char* argv[] = {"/bin/sh", "-c", script, nullptr};
  struct Case {
    const char* mode;
    std::string output;
  } cases[] = {{"rB", "out\nerr\n"}, {"r", "out\n"}, {"rBe", "out\nerr\n"}, {"re", "out\n"}};
  for (const Case& c : cases) {
    SCOPED_TRACE(c.mode);
    FILE* stream = TLIBCPopen(argv, c.mode);
    ASSERT_NE(nullptr, stream);
    EXPECT_EQ(c.output, ReadStream(stream));
    EXPECT_EQ(3, TLIBCPclose(stream));
  }
  const char* args[] = {"/bin/sh", "-c", "printf '[%s]' \"$@\"", "sh", "", "a b", "", nullptr};
  FILE* stream = TLIBCPopen(args, "r");
  ASSERT_NE(nullptr, stream);
  EXPECT_EQ("[][a b][]", ReadStream(stream));
  EXPECT_EQ(0, TLIBCPclose(stream));
}

TEST(TLIBCPopen, FailuresAndSignals) {
  const char* killed[] = {"/bin/sh", "-c", "echo partial; kill -KILL $$", nullptr};
  FILE* stream = TLIBCPopen(killed, "rB");
  ASSERT_NE(nullptr, stream);
  EXPECT_EQ("partial\n", ReadStream(stream));
  EXPECT_EQ(-1, TLIBCPclose(stream));

  const char* missing[] = {"/nonexistent/nginx", "-t", nullptr};
  errno = 0;
  EXPECT_EQ(nullptr, TLIBCPopen(missing, "rB"));
  EXPECT_EQ(ENOENT, errno);

  const char* argv[] = {"/bin/true", nullptr};
  for (const char* mode : {"w", "", "Br"}) {
    SCOPED_TRACE(mode);
    errno = 0;
    EXPECT_EQ(nullptr, TLIBCPopen(argv, mode));
    EXPECT_EQ(EINVAL, errno);
  }
  errno = 0;
  EXPECT_EQ(nullptr, TLIBCPopen(argv, nullptr));
  EXPECT_EQ(EINVAL, errno);

  // A stream that TLIBCPopen did not open is refused and left open.
  FILE* other = std::fopen("/proc/self/stat", "r");
  ASSERT_NE(nullptr, other);
  errno = 0;
  EXPECT_EQ(-1, TLIBCPclose(other));
  EXPECT_EQ(ECHILD, errno);
  EXPECT_EQ(0, std::fclose(other));
}

TEST(TLIBCPopen, StreamsOfManyThreadsFindTheirOwnChild) {
  constexpr int kThreads = 6;
  constexpr int kRounds = 15;
  std::vector<int> mismatches(kThreads, 0);
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([t, &mismatches] {
      std::string script = "echo " + std::to_string(t) + "; exit " + std::to_string(t + 10);
      const char* argv[] = {"/bin/sh", "-c", script.c_str(), nullptr};
      for (int round = 0; round < kRounds; ++round) {
        FILE* stream = TLIBCPopen(argv, "r");
        if (stream == nullptr) {
          ++mismatches[t];
          continue;
        }
        std::string output = ReadStream(stream);
        if (TLIBCPclose(stream) != t + 10 || output != std::to_string(t) + "\n") ++mismatches[t];
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(std::vector<int>(kThreads, 0), mismatches);
}

}  // namespace
