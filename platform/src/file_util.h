// Descriptor ownership and whole-file helpers shared by the platform library.
// Every descriptor is opened close-on-exec and every call retries EINTR.
// Helpers never log; on failure they return false (or an invalid UniqueFd)
// with errno set.
#ifndef TAVO_PLATFORM_FILE_UTIL_H_
#define TAVO_PLATFORM_FILE_UTIL_H_

#include <sys/types.h>

#include <functional>
#include <string>
#include <string_view>

// Internal to the library: not exported.
#pragma GCC visibility push(hidden)

namespace tavo::internal {

// Owns one file descriptor and closes it on destruction. Move-only.
class UniqueFd {
 public:
  UniqueFd() = default;
  explicit UniqueFd(int fd) : fd_(fd) {}
  UniqueFd(UniqueFd&& other) noexcept : fd_(other.Release()) {}
  UniqueFd& operator=(UniqueFd&& other) noexcept;
  UniqueFd(const UniqueFd&) = delete;
  UniqueFd& operator=(const UniqueFd&) = delete;
  ~UniqueFd();

  int get() const { return fd_; }
  bool valid() const { return fd_ >= 0; }
  // Gives up ownership and returns the descriptor.
  int Release() noexcept;
  // Closes the descriptor now; false with errno set when close reports an
  // error (the descriptor is gone either way).
  bool Close();

 private:
  int fd_ = -1;
};

// open(2) with O_CLOEXEC added, retried on EINTR.
UniqueFd Open(const std::string& path, int flags, mode_t mode = 0);

// Reads `fd` to its end into *out (replacing its contents).
bool ReadAll(int fd, std::string* out);

// Reads the whole file `path` into *out; *out is unchanged on failure.
bool ReadFile(const std::string& path, std::string* out);

// Writes all of `bytes` to `fd`, finishing short writes.
bool WriteAll(int fd, std::string_view bytes);

// Replaces `path` atomically: `fill` writes the new contents into a temporary
// file beside `path`, which then gets `mode`, is flushed to disk and renamed
// over `path`. On any failure (including `fill` returning false with errno
// set) `path` is unchanged and the temporary file is removed.
bool ReplaceFile(const std::string& path, mode_t mode, const std::function<bool(int fd)>& fill);

// ReplaceFile with fixed contents.
bool ReplaceFileWithBytes(const std::string& path, std::string_view bytes, mode_t mode);

}  // namespace tavo::internal

#pragma GCC visibility pop

#endif  // TAVO_PLATFORM_FILE_UTIL_H_
