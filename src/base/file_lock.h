// flock(2) on a lock file, owned by a descriptor.
#ifndef TAVOW3_SRC_BASE_FILE_LOCK_H_
#define TAVOW3_SRC_BASE_FILE_LOCK_H_

#include <sys/types.h>

#include <string>

#include "base/export.h"
#include "base/unique_fd.h"

namespace tavow3::base {

// flock(2) with EINTR retried. `operation` is LOCK_SH, LOCK_EX or LOCK_UN,
// optionally with LOCK_NB.
TAVOW3_INTERNAL bool Flock(int fd, int operation);

// A lock file opened read-only (created with `mode` when missing, close-on-exec)
// and locked with `operation`. Tests false, errno set, when either step failed;
// the lock goes with the descriptor on destruction.
class TAVOW3_INTERNAL FileLock {
 public:
  FileLock() = default;
  FileLock(const std::string& path, int operation, mode_t mode = 0444);
  FileLock(FileLock&&) noexcept = default;
  FileLock& operator=(FileLock&&) noexcept = default;

  bool locked() const { return fd_.valid(); }
  explicit operator bool() const { return locked(); }
  int fd() const { return fd_.get(); }

 private:
  UniqueFd fd_;
};

}  // namespace tavow3::base

#endif  // TAVOW3_SRC_BASE_FILE_LOCK_H_
