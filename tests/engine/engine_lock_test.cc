// The engine's hold on "/run/lock/tavow3.lock": shared for its life,
// exclusive between lock() and unlock(), across processes.
#include <tavow3/engine.h>

#include <fcntl.h>
#include <sys/file.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <chrono>
#include <fstream>
#include <string>
#include <thread>

#include "base/fault.h"
#include "base/unique_fd.h"
#include "engine/engine_private.h"

namespace tavow3 {
namespace {

namespace fault = base::fault;

constexpr char kLockPath[] = "/run/lock/tavow3.lock";

// A second open file description of the lock file: its flock requests meet
// the engine's as another process's would.
class Probe {
 public:
  Probe() : fd_(open(kLockPath, O_RDONLY | O_CLOEXEC)) {}
  bool valid() const { return fd_.valid(); }
  // Whether a lock of `operation` would be granted now (released again).
  bool CanLock(int operation) {
    if (flock(fd_.get(), operation | LOCK_NB) != 0) return false;
    flock(fd_.get(), LOCK_UN);
    return true;
  }

 private:
  base::UniqueFd fd_;
};

// Number of this process's descriptors open on the lock file.
int OpenLockDescriptors() {
  int count = 0;
  for (int fd = 0; fd < 1024; ++fd) {
    char link[64];
    char target[256];
    std::snprintf(link, sizeof link, "/proc/self/fd/%d", fd);
    const ssize_t length = readlink(link, target, sizeof target - 1);
    if (length < 0) continue;
    target[length] = '\0';
    if (std::string(target) == kLockPath) ++count;
  }
  return count;
}

char ReadByte(int fd) {
  char byte = 0;
  return read(fd, &byte, 1) == 1 ? byte : '?';
}

void WriteByte(int fd, char byte) { ASSERT_EQ(1, write(fd, &byte, 1)); }

// True when /proc/locks lists a pending exclusive flock request on `inode`.
bool ExclusiveRequestWaits(ino_t inode) {
  std::ifstream locks("/proc/locks");
  const std::string needle = ":" + std::to_string(inode) + " ";
  for (std::string line; std::getline(locks, line);) {
    if (line.find("->") != std::string::npos && line.find("FLOCK") != std::string::npos &&
        line.find("WRITE") != std::string::npos && line.find(needle) != std::string::npos) {
      return true;
    }
  }
  return false;
}

TEST(EngineLock, SharedForLifeExclusiveBetweenLockAndUnlock) {
  mkdir("/run/lock", 0755);
  unlink(kLockPath);
  auto engine = std::make_unique<Engine>();
  ASSERT_GE(engine->impl().lock_fd, 0);
  struct stat st;
  ASSERT_EQ(0, stat(kLockPath, &st));
  EXPECT_EQ(0444u, st.st_mode & 07777);
  EXPECT_EQ(FD_CLOEXEC, fcntl(engine->impl().lock_fd, F_GETFD) & FD_CLOEXEC);

  Probe probe;
  ASSERT_TRUE(probe.valid());
  EXPECT_TRUE(probe.CanLock(LOCK_SH));
  EXPECT_FALSE(probe.CanLock(LOCK_EX));

  {
    Engine second;  // shared locks coexist
    EXPECT_GE(second.impl().lock_fd, 0);
  }

  ASSERT_TRUE(engine->impl().lock());
  EXPECT_FALSE(probe.CanLock(LOCK_SH));
  engine->impl().unlock();
  EXPECT_GE(engine->impl().lock_fd, 0);
  EXPECT_TRUE(probe.CanLock(LOCK_SH));
  EXPECT_FALSE(probe.CanLock(LOCK_EX));

  engine.reset();  // the last handle closes the descriptor and drops the lock
  EXPECT_TRUE(probe.CanLock(LOCK_EX));
  EXPECT_EQ(1, OpenLockDescriptors());  // the probe's own
}

// A failed flock closes the descriptor for good; a failed release before the
// exclusive lock does not matter.
TEST(EngineLock, FlockFailures) {
  struct Case {
    const char* what;
    fault::Op op;
    int nth;           // which matching call fails
    bool in_lock;      // while lock() runs (else unlock() after lock())
    bool lock_result;  // what lock() returns
    bool keeps_fd;
  };
  const Case cases[] = {
      {"lock: release fails", fault::Op::kFlock, 1, true, true, true},
      {"lock: exclusive fails", fault::Op::kFlock, 2, true, false, false},
      {"unlock: release fails", fault::Op::kFlock, 1, false, true, true},
      {"unlock: shared fails", fault::Op::kFlock, 2, false, true, false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    Engine engine;
    ASSERT_GE(engine.impl().lock_fd, 0);
    if (c.in_lock) {
      fault::Arm arm(c.nth, fault::kOnce, EIO, c.op);
      EXPECT_EQ(c.lock_result, engine.impl().lock());
      EXPECT_TRUE(arm.fired());
    } else {
      ASSERT_TRUE(engine.impl().lock());
      fault::Arm arm(c.nth, fault::kOnce, EIO, c.op);
      engine.impl().unlock();
      EXPECT_TRUE(arm.fired());
    }
    EXPECT_EQ(c.keeps_fd, engine.impl().lock_fd >= 0);
    EXPECT_EQ(c.keeps_fd ? 1 : 0, OpenLockDescriptors());
    if (!c.keeps_fd) {
      EXPECT_FALSE(engine.impl().lock());  // for good, though the fault was once
      engine.impl().unlock();
      EXPECT_EQ(-1, engine.impl().lock_fd);
    }
  }
  // Construction: neither a failed open nor a failed shared lock is fatal.
  for (fault::Op op : {fault::Op::kOpen, fault::Op::kFlock}) {
    fault::Arm arm(1, fault::kOnce, EIO, op);
    Engine engine;
    EXPECT_TRUE(arm.fired());
    EXPECT_EQ(-1, engine.impl().lock_fd);
    EXPECT_EQ(0, OpenLockDescriptors());
    EXPECT_FALSE(engine.impl().lock());
  }
}

// Two processes: their shared locks coexist; the child's lock() waits until
// the parent's engine is gone, proven by the order of events on the pipes and
// the child's pending request in /proc/locks.
TEST(EngineLock, ExclusiveLockWaitsForTheOtherProcess) {
  auto engine = std::make_unique<Engine>();
  ASSERT_GE(engine->impl().lock_fd, 0);
  struct stat st;
  ASSERT_EQ(0, stat(kLockPath, &st));
  int to_child[2];
  int from_child[2];
  ASSERT_EQ(0, pipe2(to_child, O_CLOEXEC));
  ASSERT_EQ(0, pipe2(from_child, O_CLOEXEC));
  const pid_t child = fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    close(to_child[1]);
    close(from_child[0]);
    // The inherited descriptor shares the parent's open file description and
    // with it the parent's lock: drop it without unlocking.
    close(engine->impl().lock_fd);
    (void)engine.release();
    Engine mine;
    const char shared = mine.impl().lock_fd >= 0 ? 'S' : 'F';
    (void)!write(from_child[1], &shared, 1);
    const char exclusive = mine.impl().lock() ? 'X' : 'F';
    (void)!write(from_child[1], &exclusive, 1);
    char go;
    (void)!read(to_child[0], &go, 1);
    mine.impl().unlock();
    const char back = mine.impl().lock_fd >= 0 ? 'U' : 'F';
    (void)!write(from_child[1], &back, 1);
    (void)!read(to_child[0], &go, 1);  // until the parent closes the pipe
    _exit(0);
  }
  close(to_child[0]);
  close(from_child[1]);
  base::UniqueFd commands(to_child[1]);
  base::UniqueFd events(from_child[0]);
  ASSERT_EQ('S', ReadByte(events.get()));
  while (!ExclusiveRequestWaits(st.st_ino)) {
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
  // Blocked, and nothing said yet.
  ASSERT_EQ(0, fcntl(events.get(), F_SETFL, O_NONBLOCK));
  char early;
  EXPECT_EQ(-1, read(events.get(), &early, 1));
  EXPECT_EQ(EAGAIN, errno);
  ASSERT_EQ(0, fcntl(events.get(), F_SETFL, 0));

  Probe probe;
  engine.reset();
  EXPECT_EQ('X', ReadByte(events.get()));
  EXPECT_FALSE(probe.CanLock(LOCK_SH));
  WriteByte(commands.get(), 'g');
  EXPECT_EQ('U', ReadByte(events.get()));
  EXPECT_TRUE(probe.CanLock(LOCK_SH));
  EXPECT_FALSE(probe.CanLock(LOCK_EX));
  commands.Reset();
  int status = 0;
  ASSERT_EQ(child, waitpid(child, &status, 0));
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
  EXPECT_TRUE(probe.CanLock(LOCK_EX));
}

// Without a lock file that can be opened the engine still loads and
// registers; only lock() refuses. A read-only directory that holds the file
// is fine: flock needs no write access.
TEST(EngineLock, LockFileThatCannotBeCreated) {
  static int loads = 0;
  Engine::Register([](Engine& engine) {
    ++loads;
    engine.impl().names.insert("loaded");
  });
  struct Case {
    const char* what;
    const char* mount_point;
    bool with_file;
    bool locks;
  };
  const Case cases[] = {
      {"read-only tmpfs at /run/lock", "/run/lock", false, false},
      {"read-only tmpfs at /run", "/run", false, false},
      {"read-only /run/lock holding the file", "/run/lock", true, true},
  };
  int expected_loads = 0;
  mkdir("/run/lock", 0755);
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    if (c.with_file) {
      base::UniqueFd(open(kLockPath, O_RDONLY | O_CREAT | O_CLOEXEC, 0444));
      ASSERT_EQ(0, mount("/run/lock", "/run/lock", nullptr, MS_BIND, nullptr));
      ASSERT_EQ(0, mount(nullptr, "/run/lock", nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY,
                         nullptr));
    } else {
      ASSERT_EQ(0, mount("tmpfs", c.mount_point, "tmpfs", MS_RDONLY, "size=64k"));
    }
    {
      Engine engine;
      EXPECT_EQ(c.locks, engine.impl().lock_fd >= 0);
      engine.load();
      EXPECT_EQ(++expected_loads, loads);
      EXPECT_EQ(1u, engine.impl().names.count("loaded"));
      EXPECT_EQ(c.locks, engine.impl().lock());
      engine.impl().unlock();
      EXPECT_EQ(c.locks, engine.impl().lock_fd >= 0);
    }
    ASSERT_EQ(0, umount2(c.mount_point, MNT_DETACH));
  }
}

}  // namespace
}  // namespace tavow3
