// Move-only owner of a file descriptor; closes it on destruction.
#ifndef TAVOW3_SRC_BASE_UNIQUE_FD_H_
#define TAVOW3_SRC_BASE_UNIQUE_FD_H_

#include "base/export.h"

namespace tavow3::base {

class TAVOW3_INTERNAL UniqueFd {
 public:
  UniqueFd() = default;
  explicit UniqueFd(int fd) : fd_(fd) {}
  UniqueFd(UniqueFd&& other) noexcept : fd_(other.Release()) {}
  UniqueFd& operator=(UniqueFd&& other) noexcept;
  ~UniqueFd();
  UniqueFd(const UniqueFd&) = delete;
  UniqueFd& operator=(const UniqueFd&) = delete;

  bool valid() const { return fd_ >= 0; }
  explicit operator bool() const { return valid(); }
  int get() const { return fd_; }
  // Gives up ownership and returns the descriptor (-1 when empty).
  int Release() noexcept;
  // Closes the descriptor now; true when close(2) succeeded or it was empty.
  bool Reset() noexcept;

 private:
  int fd_ = -1;
};

}  // namespace tavow3::base

#endif  // TAVOW3_SRC_BASE_UNIQUE_FD_H_
