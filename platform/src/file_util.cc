#include "file_util.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <vector>

namespace tavo::internal {

UniqueFd& UniqueFd::operator=(UniqueFd&& other) noexcept {
  if (this != &other) {
    (void)Close();
    fd_ = other.Release();
  }
  return *this;
}

UniqueFd::~UniqueFd() {
  int saved = errno;
  (void)Close();
  errno = saved;
}

int UniqueFd::Release() noexcept {
  int fd = fd_;
  fd_ = -1;
  return fd;
}

bool UniqueFd::Close() {
  if (fd_ < 0) return true;
  // Linux releases the descriptor even when close reports EINTR, so it is
  // never retried.
  int rc = ::close(Release());
  return rc == 0 || errno == EINTR;
}

UniqueFd Open(const std::string& path, int flags, mode_t mode) {
  int fd;
  do {
    fd = ::open(path.c_str(), flags | O_CLOEXEC, mode);
  } while (fd < 0 && errno == EINTR);
  return UniqueFd(fd);
}

bool ReadAll(int fd, std::string* out) {
  std::string data;
  char buffer[16384];
  for (;;) {
    ssize_t n = ::read(fd, buffer, sizeof buffer);
    if (n < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    if (n == 0) break;
    data.append(buffer, static_cast<size_t>(n));
  }
  out->swap(data);
  return true;
}

bool ReadFile(const std::string& path, std::string* out) {
  UniqueFd fd = Open(path, O_RDONLY | O_NOCTTY);
  return fd.valid() && ReadAll(fd.get(), out);
}

bool WriteAll(int fd, std::string_view bytes) {
  while (!bytes.empty()) {
    ssize_t n = ::write(fd, bytes.data(), bytes.size());
    if (n < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    bytes.remove_prefix(static_cast<size_t>(n));
  }
  return true;
}

namespace {

bool Fsync(int fd) {
  int rc;
  do {
    rc = ::fsync(fd);
  } while (rc != 0 && errno == EINTR);
  return rc == 0;
}

bool Fchmod(int fd, mode_t mode) {
  int rc;
  do {
    rc = ::fchmod(fd, mode);
  } while (rc != 0 && errno == EINTR);
  return rc == 0;
}

// Flushes the directory holding `path` so that a rename survives a power
// loss. Best effort: the rename itself already succeeded.
void SyncParentDirectory(const std::string& path) {
  std::string::size_type slash = path.rfind('/');
  std::string dir = slash == std::string::npos ? "." : slash == 0 ? "/" : path.substr(0, slash);
  UniqueFd fd = Open(dir, O_RDONLY | O_DIRECTORY);
  if (fd.valid()) (void)Fsync(fd.get());
}

}  // namespace

bool ReplaceFile(const std::string& path, mode_t mode, const std::function<bool(int fd)>& fill) {
  std::vector<char> pattern(path.begin(), path.end());
  static constexpr char kSuffix[] = ".XXXXXX";
  pattern.insert(pattern.end(), kSuffix, kSuffix + sizeof kSuffix);  // with the NUL
  int raw;
  do {
    raw = ::mkostemp(pattern.data(), O_CLOEXEC);
  } while (raw < 0 && errno == EINTR);
  if (raw < 0) return false;
  UniqueFd fd(raw);
  std::string temp(pattern.data());
  bool ok = fill(fd.get()) && Fchmod(fd.get(), mode) && Fsync(fd.get()) && fd.Close() &&
            ::rename(temp.c_str(), path.c_str()) == 0;
  if (!ok) {
    int saved = errno;
    (void)fd.Close();
    (void)::unlink(temp.c_str());
    errno = saved;
    return false;
  }
  SyncParentDirectory(path);
  return true;
}

bool ReplaceFileWithBytes(const std::string& path, std::string_view bytes, mode_t mode) {
  return ReplaceFile(path, mode, [bytes](int fd) { return WriteAll(fd, bytes); });
}

}  // namespace tavo::internal
