#include "base/file_lock.h"

#include <sys/file.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "base/child_process.h"
#include "base/fault.h"
#include "base/file_io.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::base {
namespace {

constexpr char kLockDir[] = "/tmp/filelock";
constexpr char kLockPath[] = "/tmp/filelock/base_test.lock";

// A forked child that takes `operation` on the lock file, reports through a
// pipe, and holds the lock until the parent closes its end of another pipe.
class LockHolder {
 public:
  explicit LockHolder(int operation) {
    UniqueFd ready_read, ready_write, release_read, release_write;
    if (!Pipe(&ready_read, &ready_write) || !Pipe(&release_read, &release_write)) return;
    const pid_t pid = Fork();
    if (pid == 0) {
      (void)ready_read.Reset();
      (void)release_write.Reset();
      FileLock lock(kLockPath, operation);
      (void)WriteAll(ready_write.get(), lock ? "1" : "0");
      char byte;
      (void)ReadSome(release_read.get(), &byte, 1);  // end of file: the parent let go
      Exit(0);
    }
    child_ = ChildProcess(pid);
    (void)ready_write.Reset();
    char byte = 0;
    locked_ = ReadSome(ready_read.get(), &byte, 1) == 1 && byte == '1';
    release_ = std::move(release_write);
  }

  bool locked() const { return locked_; }
  // Lets the child drop its lock and exit; its exit status.
  int Release() {
    (void)release_.Reset();
    return child_.Wait();
  }

 private:
  ChildProcess child_;
  UniqueFd release_;
  bool locked_ = false;
};

class FileLockTest : public testing::Test {
 protected:
  void SetUp() override { test::FreshDir(kLockDir); }
};

TEST_F(FileLockTest, ExclusiveAndSharedBetweenProcesses) {
  struct Case {
    const char* what;
    int held;
    int wanted;
    bool granted;
  };
  const std::vector<Case> cases = {
      {"exclusive blocks shared", LOCK_EX, LOCK_SH | LOCK_NB, false},
      {"exclusive blocks exclusive", LOCK_EX, LOCK_EX | LOCK_NB, false},
      {"shared allows shared", LOCK_SH, LOCK_SH | LOCK_NB, true},
      {"shared blocks exclusive", LOCK_SH, LOCK_EX | LOCK_NB, false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    LockHolder holder(c.held);
    ASSERT_TRUE(holder.locked());
    {
      errno = 0;
      FileLock lock(kLockPath, c.wanted);
      EXPECT_EQ(c.granted, lock.locked());
      if (!c.granted) {
        EXPECT_EQ(EWOULDBLOCK, errno);
      }
    }
    EXPECT_EQ(0, holder.Release());
    // The child's exit dropped its lock.
    FileLock after(kLockPath, LOCK_EX | LOCK_NB);
    EXPECT_TRUE(after.locked()) << strerror(errno);
  }
}

TEST_F(FileLockTest, DestructionAndMoveKeepTheLockWithTheDescriptor) {
  FileLock moved;
  {
    FileLock lock(kLockPath, LOCK_EX);
    ASSERT_TRUE(lock.locked());
    moved = std::move(lock);
    EXPECT_FALSE(lock.locked());
  }
  LockHolder blocked(LOCK_EX | LOCK_NB);
  EXPECT_FALSE(blocked.locked());  // still held through `moved`
  EXPECT_EQ(0, blocked.Release());

  moved = FileLock();
  LockHolder free(LOCK_EX | LOCK_NB);
  EXPECT_TRUE(free.locked());
  EXPECT_EQ(0, free.Release());
}

TEST_F(FileLockTest, CreatesMissingFileWithModeAndCloseOnExec) {
  for (mode_t mode : {0444, 0600}) {
    SCOPED_TRACE(mode);
    std::remove(kLockPath);
    FileLock lock(kLockPath, LOCK_SH, mode);
    ASSERT_TRUE(lock.locked()) << strerror(errno);
    struct stat st;
    ASSERT_EQ(0, ::stat(kLockPath, &st));
    EXPECT_EQ(mode, st.st_mode & 07777);
    EXPECT_TRUE(test::IsCloseOnExec(lock.fd()));
  }
}

TEST_F(FileLockTest, FailuresLeaveNoDescriptorAndKeepErrno) {
  const int before = test::OpenDescriptors();
  errno = 0;
  FileLock missing("/tmp/filelock/missing/base_test.lock", LOCK_EX);
  EXPECT_FALSE(missing.locked());
  EXPECT_EQ(ENOENT, errno);
  {
    fault::Arm arm(1, fault::kOnce, EDOM, fault::Op::kFlock);
    errno = 0;
    FileLock faulted(kLockPath, LOCK_EX);
    EXPECT_FALSE(faulted.locked());
    EXPECT_EQ(EDOM, errno);
    EXPECT_TRUE(arm.fired());
  }
  errno = 0;
  EXPECT_FALSE(Flock(-1, LOCK_EX));
  EXPECT_EQ(EBADF, errno);
  EXPECT_EQ(before, test::OpenDescriptors());
}

}  // namespace
}  // namespace tavow3::base
