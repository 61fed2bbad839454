#include <tavow3/gen_nginx_conf.h>
#include <tavow3/lock.h>

#include <fcntl.h>
#include <poll.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <memory>
#include <sstream>
#include <string>

#include <gtest/gtest.h>

#include "base/fault.h"
#include "deploy_fixtures.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::test {
namespace {

constexpr char kLockPath[] = "/run/lock/nginx_gen.lock";

// Whether a second open file description of the lock file gets the lock now.
bool LockIsFree() { return CanFlock(kLockPath, LOCK_EX); }

// Reads one byte from `fd`, waiting at most `timeout_ms`; 0 when none came.
char ReadByte(int fd, int timeout_ms) {
  pollfd ready = {fd, POLLIN, 0};
  char byte = 0;
  if (::poll(&ready, 1, timeout_ms) != 1 || ::read(fd, &byte, 1) != 1) return 0;
  return byte;
}

TEST(GenerationLock, OpensTheLockFileCloseOnExecAndLocksOnlyWhenAsked) {
  {
    Lock lock;
    struct stat st;
    ASSERT_EQ(0, ::stat(kLockPath, &st));
    EXPECT_EQ(0444u, st.st_mode & 07777);
    // Find the descriptor through /proc and read its open flags.
    std::string flags;
    for (int fd = 3; fd < 256 && flags.empty(); ++fd) {
      if (LinkTarget("/proc/self/fd/" + std::to_string(fd)) != kLockPath) continue;
      std::istringstream info(ReadBytes("/proc/self/fdinfo/" + std::to_string(fd)));
      for (std::string key; info >> key;) {
        if (key == "flags:") info >> flags;
      }
    }
    ASSERT_FALSE(flags.empty());
    const long open_flags = std::strtol(flags.c_str(), nullptr, 8);
    EXPECT_EQ(O_CLOEXEC, open_flags & O_CLOEXEC);
    EXPECT_EQ(O_RDONLY, open_flags & O_ACCMODE);

    EXPECT_TRUE(LockIsFree());
    ASSERT_TRUE(lock.lock());
    EXPECT_FALSE(LockIsFree());
    lock.unlock();
    EXPECT_TRUE(LockIsFree());
    ASSERT_TRUE(lock.lock());
  }
  EXPECT_TRUE(LockIsFree());  // the destructor released it
}

TEST(GenerationLock, ExcludesASecondProcessUntilReleased) {
  InstallGenerator(/*valid=*/true);
  auto holder = std::make_unique<Lock>();
  ASSERT_TRUE(holder->lock());

  int pipe_fds[2];
  ASSERT_EQ(0, ::pipe(pipe_fds));
  const pid_t child = ::fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    ::close(pipe_fds[0]);
    (void)!::write(pipe_fds[1], "a", 1);
    GenNginxConf generation;  // blocks on the lock, then runs the generator
    const bool valid = generation.TestNginxTmpConf();
    (void)!::write(pipe_fds[1], valid ? "b" : "x", 1);
    ::_exit(0);
  }
  ::close(pipe_fds[1]);
  ASSERT_EQ('a', ReadByte(pipe_fds[0], 10000));
  ASSERT_TRUE(WaitUntil([&] { return IsWaitingForFlock(child); }));
  EXPECT_EQ(0, GeneratorRuns());
  EXPECT_EQ(0, ReadByte(pipe_fds[0], 0));

  holder.reset();
  EXPECT_EQ('b', ReadByte(pipe_fds[0], 30000));
  EXPECT_EQ(1, GeneratorRuns());
  ::close(pipe_fds[0]);
  int status = 0;
  ASSERT_EQ(child, ::waitpid(child, &status, 0));
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
  EXPECT_TRUE(LockIsFree());
}

TEST(GenerationLock, UnopenableLockFileRefusesLockAndGeneratesNothing) {
  InstallGenerator(/*valid=*/true);
  {
    base::fault::Arm arm(1, base::fault::kOnce, EACCES, base::fault::Op::kOpen);
    Lock lock;
    EXPECT_TRUE(arm.fired());
    EXPECT_FALSE(lock.lock());
    lock.unlock();  // harmless without a descriptor
  }
  {
    base::fault::Arm arm(1, base::fault::kOnce, EACCES, base::fault::Op::kOpen);
    GenNginxConf generation;
    EXPECT_TRUE(arm.fired());
    EXPECT_FALSE(generation.TestNginxTmpConf());
  }
  EXPECT_EQ(0, GeneratorRuns());
  EXPECT_FALSE(PathExists(kLockPath));
}

TEST(GenerationLock, FailedFlockRefusesLock) {
  Lock lock;
  base::fault::Arm arm(1, base::fault::kOnce, ENOLCK, base::fault::Op::kFlock);
  EXPECT_FALSE(lock.lock());
  EXPECT_TRUE(arm.fired());
}

TEST(GenNginxConf, TestsTheGeneratedConfigurationUnderTheLock) {
  for (bool valid : {true, false}) {
    SCOPED_TRACE(valid ? "valid" : "broken");
    InstallGenerator(valid);
    const int runs = GeneratorRuns();
    GenNginxConf generation;
    EXPECT_FALSE(LockIsFree());
    EXPECT_EQ(runs + 1, GeneratorRuns());
    EXPECT_EQ(valid, generation.TestNginxTmpConf());
    EXPECT_FALSE(LockIsFree());
  }
  EXPECT_TRUE(LockIsFree());
}

}  // namespace
}  // namespace tavow3::test
