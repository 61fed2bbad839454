#include <tavow3/lock.h>

#include <fcntl.h>
#include <sys/file.h>

#include "base/file_io.h"
#include "base/file_lock.h"
#include "base/unique_fd.h"

namespace {

constexpr char kGenerationLockPath[] = "/run/lock/nginx_gen.lock";
constexpr mode_t kLockFileMode = 0444;

namespace base = tavow3::base;

}  // namespace

Lock::Lock()
    : fd_(base::Open(kGenerationLockPath, O_RDONLY | O_CREAT, kLockFileMode).Release()) {}

Lock::~Lock() {
  if (fd_ < 0) return;
  (void)base::Flock(fd_, LOCK_UN);
  (void)base::UniqueFd(fd_).Reset();
}

bool Lock::lock() { return fd_ >= 0 && base::Flock(fd_, LOCK_EX); }

void Lock::unlock() {
  if (fd_ >= 0) (void)base::Flock(fd_, LOCK_UN);
}
