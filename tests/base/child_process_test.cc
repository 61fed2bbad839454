#include "base/child_process.h"

#include <pthread.h>
#include <signal.h>
#include <sys/wait.h>

#include <cerrno>
#include <cstring>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "base/fault.h"
#include "base/file_io.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::base {
namespace {

// Runs `argv` with its standard output (and whatever `options` add) on a
// pipe; returns the exit status and stores the output.
int RunCapturing(const std::vector<std::string>& argv, SpawnOptions options, std::string* out) {
  UniqueFd read_end;
  UniqueFd write_end;
  if (!Pipe(&read_end, &write_end)) return -2;
  options.stdout_fd = write_end.get();
  ChildProcess child = Spawn(argv, options);
  (void)write_end.Reset();  // the child holds the only write end now
  if (!child) return -2;
  out->clear();
  if (!ReadAll(read_end.get(), out)) return -2;
  return child.Wait();
}

// True when this process has no child left, running or zombie.
bool NoChildren() {
  int status;
  errno = 0;
  return WaitPid(-1, &status, WNOHANG) == -1 && errno == ECHILD;
}

TEST(ChildProcess, ExitStatusesAndSignalDeath) {
  struct Case {
    std::string script;
    int status;
  };
  const std::vector<Case> cases = {
      {"exit 0", 0},   {"exit 1", 1},           {"exit 42", 42},
      {"exit 255", 255}, {"kill -KILL $$", -1}, {"kill -TERM $$", -1},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.script);
    EXPECT_EQ(c.status, base::Run({"/bin/sh", "-c", c.script}));
  }
  EXPECT_TRUE(NoChildren());
}

TEST(ChildProcess, ArgumentsPassUnchangedWithoutShell) {
  std::string out;
  const std::vector<std::string> argv = {"/usr/bin/printf", "[%s]", "", "a b", "", "$HOME", "*",
                                         "'q'", "x;y"};
  ASSERT_EQ(0, RunCapturing(argv, {}, &out));
  EXPECT_EQ("[][a b][][$HOME][*]['q'][x;y]", out);
}

TEST(ChildProcess, MissingProgramIsASpawnFailure) {
  test::FreshDir("/tmp/spawn");
  test::WriteBytes("/tmp/spawn/not-executable", "#!/bin/sh\nexit 0\n");
  ::chmod("/tmp/spawn/not-executable", 0644);
  struct Case {
    std::vector<std::string> argv;
    int error;
  };
  const std::vector<Case> cases = {
      {{"/tmp/spawn/missing"}, ENOENT},
      {{"/tmp/spawn/missing/prog"}, ENOENT},
      {{"sh", "-c", "exit 0"}, ENOENT},  // no PATH search
      {{"/tmp/spawn"}, EACCES},
      {{}, EINVAL},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.argv.empty() ? "<empty>" : c.argv[0]);
    errno = 0;
    ChildProcess child = Spawn(c.argv);
    EXPECT_FALSE(child.valid());
    EXPECT_EQ(c.error, errno) << strerror(errno);
    EXPECT_EQ(-1, base::Run(c.argv));
  }
  // Root may not run a file without execute bits either.
  errno = 0;
  EXPECT_FALSE(Spawn({"/tmp/spawn/not-executable"}).valid());
  EXPECT_EQ(EACCES, errno);
  EXPECT_TRUE(NoChildren());  // the failed exec's child was reaped
}

TEST(ChildProcess, DestructorKillsAndReaps) {
  pid_t pid;
  {
    ChildProcess child = Spawn({"/bin/sleep", "1000"});
    ASSERT_TRUE(child.valid()) << strerror(errno);
    pid = child.pid();
    EXPECT_TRUE(test::ProcessExists(pid));
  }
  EXPECT_FALSE(test::ProcessExists(pid));  // neither running nor a zombie

  // Assignment disposes of the child it replaces; Release hands it on.
  ChildProcess child = Spawn({"/bin/sleep", "1000"});
  const pid_t first = child.pid();
  child = Spawn({"/bin/sleep", "1000"});
  const pid_t second = child.pid();
  EXPECT_FALSE(test::ProcessExists(first));
  EXPECT_TRUE(test::ProcessExists(second));
  EXPECT_EQ(second, child.Release());
  EXPECT_FALSE(child.valid());
  EXPECT_TRUE(test::ProcessExists(second));
  ASSERT_EQ(0, ::kill(second, SIGKILL));
  int status;
  EXPECT_EQ(second, WaitPid(second, &status, 0));
  EXPECT_EQ(-1, ExitStatus(status));
  EXPECT_TRUE(NoChildren());
}

TEST(ChildProcess, WaitEmptiesTheObject) {
  ChildProcess child = Spawn({"/bin/sh", "-c", "exit 3"});
  ASSERT_TRUE(child.valid());
  EXPECT_EQ(3, child.Wait());
  EXPECT_FALSE(child.valid());
  errno = 0;
  EXPECT_EQ(-1, child.Wait());
  EXPECT_EQ(ECHILD, errno);
}

TEST(ChildProcess, StandardStreams) {
  const std::vector<std::string> both = {"/bin/sh", "-c", "echo out; echo err >&2; cat"};
  struct Case {
    const char* what;
    SpawnOptions options;
    std::string output;
  };
  SpawnOptions merged;
  merged.stderr_to_stdout = true;
  merged.null_stdin = true;
  SpawnOptions quiet;
  quiet.null_stderr = true;
  quiet.null_stdin = true;
  const std::vector<Case> cases = {
      {"stderr merged", merged, "out\nerr\n"},
      {"stderr to null", quiet, "out\n"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    std::string out;
    EXPECT_EQ(0, RunCapturing(both, c.options, &out));
    EXPECT_EQ(c.output, out);
  }

  // Where the three streams point, as the shell sees them.
  test::FreshDir("/tmp/spawn");
  const std::vector<std::string> where = {
      "/bin/sh", "-c",
      "in=$(readlink /proc/$$/fd/0); out=$(readlink /proc/$$/fd/1); "
      "err=$(readlink /proc/$$/fd/2); printf '%s\\n' \"$in\" \"$out\" \"$err\" >/tmp/spawn/where"};
  SpawnOptions all_null;
  all_null.null_stdin = true;
  all_null.null_stdout = true;
  all_null.null_stderr = true;
  ASSERT_EQ(0, base::Run(where, all_null));
  EXPECT_EQ("/dev/null\n/dev/null\n/dev/null\n", test::ReadBytes("/tmp/spawn/where"));

  UniqueFd read_end;
  UniqueFd write_end;
  ASSERT_TRUE(Pipe(&read_end, &write_end));
  SpawnOptions piped = merged;
  piped.stdout_fd = write_end.get();
  ASSERT_EQ(0, base::Run(where, piped));
  const std::string pipe_name = test::ReadBytes("/tmp/spawn/where");
  const std::string expected_pipe =
      "pipe:[" + std::to_string(test::InodeOf(write_end.get())) + "]\n";
  EXPECT_EQ("/dev/null\n" + expected_pipe + expected_pipe, pipe_name);
}

// The child starts clean whatever the caller did with its signals, and
// new_session makes it a session leader.
TEST(ChildProcess, ChildStartsWithDefaultSignalsAndOptionalSession) {
  struct sigaction ignore = {};
  ignore.sa_handler = SIG_IGN;
  ASSERT_EQ(0, ::sigaction(SIGPIPE, &ignore, nullptr));
  sigset_t blocked;
  sigemptyset(&blocked);
  sigaddset(&blocked, SIGTERM);
  ASSERT_EQ(0, ::pthread_sigmask(SIG_BLOCK, &blocked, nullptr));
  // A shell cannot undo a signal ignored on entry, so it survives only if the
  // disposition leaked into it.
  EXPECT_EQ(-1, base::Run({"/bin/sh", "-c", "kill -PIPE $$; exit 0"}));
  EXPECT_EQ(-1, base::Run({"/bin/sh", "-c", "kill -TERM $$; exit 0"}));
  ASSERT_EQ(0, ::pthread_sigmask(SIG_UNBLOCK, &blocked, nullptr));

  for (bool new_session : {false, true}) {
    SCOPED_TRACE(new_session);
    SpawnOptions options;
    options.new_session = new_session;
    std::string out;
    // Field 6 of /proc/<pid>/stat is the session id; the shell's own pid is $$.
    const std::string script =
        "read -r pid comm state ppid pgrp sid rest < /proc/$$/stat; "
        "[ \"$sid\" = $$ ] && echo leader || echo member";
    ASSERT_EQ(0, RunCapturing({"/bin/sh", "-c", script}, options, &out));
    EXPECT_EQ(new_session ? "leader\n" : "member\n", out);
  }
}

TEST(ChildProcess, ForkedChildExitsWithItsStatus) {
  const pid_t pid = Fork();
  if (pid == 0) Exit(7);
  ASSERT_GT(pid, 0);
  int status;
  EXPECT_EQ(pid, WaitPid(pid, &status, 0));
  EXPECT_EQ(7, ExitStatus(status));

  ChildProcess sleeper = Spawn({"/bin/sleep", "1000"});
  ASSERT_TRUE(sleeper.valid());
  const pid_t sleeper_pid = sleeper.pid();
  EXPECT_EQ(0, WaitPid(sleeper_pid, &status, WNOHANG));
  EXPECT_TRUE(Kill(sleeper_pid, SIGTERM));
  EXPECT_EQ(-1, sleeper.Wait());
  errno = 0;
  EXPECT_FALSE(Kill(sleeper_pid, 0));  // reaped: the pid is gone
  EXPECT_EQ(ESRCH, errno);
}

TEST(ChildProcess, FaultHookStopsBeforeAnyProcessStarts) {
  test::FreshDir("/tmp/spawn");
  struct Case {
    const char* what;
    fault::Op op;
  };
  for (const Case& c : {Case{"spawn", fault::Op::kSpawn}, Case{"fork", fault::Op::kFork}}) {
    SCOPED_TRACE(c.what);
    fault::Arm arm(1, fault::kOnce, EAGAIN, c.op);
    errno = 0;
    if (c.op == fault::Op::kSpawn) {
      EXPECT_FALSE(Spawn({"/usr/bin/touch", "/tmp/spawn/ran"}).valid());
    } else {
      const pid_t pid = Fork();
      if (pid == 0) Exit(0);
      EXPECT_EQ(-1, pid);
    }
    EXPECT_EQ(EAGAIN, errno);
    EXPECT_TRUE(arm.fired());
  }
  EXPECT_TRUE(test::DirNames("/tmp/spawn").empty());
  EXPECT_TRUE(NoChildren());

  // A child whose kill fails is left alone: waiting for it could block.
  ChildProcess child = Spawn({"/bin/sleep", "1000"});
  ASSERT_TRUE(child.valid());
  const pid_t pid = child.pid();
  {
    fault::Arm arm(1, fault::kOnce, EPERM, fault::Op::kKill);
    errno = EBADF;
    child = ChildProcess();
    EXPECT_EQ(EBADF, errno);  // destruction keeps errno
  }
  EXPECT_TRUE(test::ProcessExists(pid));
  { ChildProcess adopted(pid); }
  EXPECT_FALSE(test::ProcessExists(pid));
}

}  // namespace
}  // namespace tavow3::base
