#include "base/unique_fd.h"

#include <unistd.h>

#include "base/fault.h"

namespace tavow3::base {

UniqueFd& UniqueFd::operator=(UniqueFd&& other) noexcept {
  if (this != &other) {
    (void)Reset();
    fd_ = other.Release();
  }
  return *this;
}

UniqueFd::~UniqueFd() { (void)Reset(); }

int UniqueFd::Release() noexcept {
  const int fd = fd_;
  fd_ = -1;
  return fd;
}

bool UniqueFd::Reset() noexcept {
  if (fd_ < 0) return true;
  const int fd = Release();
  if (fault::Fire(fault::Op::kClose)) {
    ::close(fd);  // the descriptor must go even when the failure is simulated
    return false;
  }
  // close(2) is not retried on EINTR: on Linux the descriptor is gone either way.
  return ::close(fd) == 0;
}

}  // namespace tavow3::base
