// Descriptor-level file calls: open, mkstemp, pipe, read, write, fsync,
// fchmod, fchown.
#include "base/file_io.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <utility>

#include "base/fault.h"

namespace tavow3::base {

UniqueFd Open(const std::string& path, int flags, mode_t mode) {
  if (fault::Fire(fault::Op::kOpen)) return UniqueFd();
  int fd;
  do {
    fd = ::open(path.c_str(), flags | O_CLOEXEC, mode);
  } while (fd < 0 && errno == EINTR);
  return UniqueFd(fd);
}

UniqueFd MakeTemp(const std::string& pattern, std::string* path) {
  if (fault::Fire(fault::Op::kMkstemp)) return UniqueFd();
  std::string name;
  int fd;
  do {
    name = pattern;  // mkostemp rewrites the X's even when it fails
    fd = ::mkostemp(name.data(), O_CLOEXEC);
  } while (fd < 0 && errno == EINTR);
  if (fd >= 0) *path = std::move(name);
  return UniqueFd(fd);
}

bool Pipe(UniqueFd* read_end, UniqueFd* write_end) {
  if (fault::Fire(fault::Op::kOpen)) return false;
  int fds[2];
  if (::pipe2(fds, O_CLOEXEC) != 0) return false;
  *read_end = UniqueFd(fds[0]);
  *write_end = UniqueFd(fds[1]);
  return true;
}

long ReadSome(int fd, char* buffer, unsigned long size) {
  if (fault::Fire(fault::Op::kRead)) return -1;
  ssize_t count;
  do {
    count = ::read(fd, buffer, size);
  } while (count < 0 && errno == EINTR);
  return count;
}

bool ReadAll(int fd, std::string* out) {
  const size_t original_size = out->size();
  char buffer[65536];
  for (;;) {
    const long count = ReadSome(fd, buffer, sizeof buffer);
    if (count == 0) return true;
    if (count < 0) {
      out->resize(original_size);  // a failed read leaves *out as it was
      return false;
    }
    out->append(buffer, static_cast<size_t>(count));
  }
}

bool WriteAll(int fd, std::string_view bytes) {
  if (fault::Fire(fault::Op::kWrite)) return false;
  while (!bytes.empty()) {
    const ssize_t count = ::write(fd, bytes.data(), bytes.size());
    if (count < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    if (count == 0) {  // no progress and no error: do not spin
      errno = EIO;
      return false;
    }
    bytes.remove_prefix(static_cast<size_t>(count));
  }
  return true;
}

bool Fsync(int fd) {
  if (fault::Fire(fault::Op::kFsync)) return false;
  int result;
  do {
    result = ::fsync(fd);
  } while (result != 0 && errno == EINTR);
  return result == 0;
}

bool Fchmod(int fd, mode_t mode) {
  if (fault::Fire(fault::Op::kChmod)) return false;
  return ::fchmod(fd, mode) == 0;
}

bool Fchown(int fd, uid_t uid, gid_t gid) {
  if (fault::Fire(fault::Op::kChown)) return false;
  return ::fchown(fd, uid, gid) == 0;
}

bool ReadFile(const std::string& path, std::string* out) {
  UniqueFd fd = Open(path, O_RDONLY);
  if (!fd.valid()) return false;
  std::string bytes;
  if (!ReadAll(fd.get(), &bytes)) return false;
  *out = std::move(bytes);
  return true;
}

}  // namespace tavow3::base
