#include "base/file_lock.h"

#include <fcntl.h>
#include <sys/file.h>

#include <cerrno>

#include "base/fault.h"
#include "base/file_io.h"

namespace tavow3::base {

bool Flock(int fd, int operation) {
  if (fault::Fire(fault::Op::kFlock)) return false;
  int result;
  do {
    result = ::flock(fd, operation);
  } while (result != 0 && errno == EINTR);
  return result == 0;
}

FileLock::FileLock(const std::string& path, int operation, mode_t mode) {
  UniqueFd fd = Open(path, O_RDONLY | O_CREAT, mode);
  if (!fd.valid()) return;
  if (!Flock(fd.get(), operation)) {
    const int saved_errno = errno;  // the close must not hide why the lock failed
    (void)fd.Reset();
    errno = saved_errno;
    return;
  }
  fd_ = std::move(fd);
}

}  // namespace tavow3::base
