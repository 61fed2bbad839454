#include "support/test_mounts.h"

#include <fcntl.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <unistd.h>

#include <cerrno>

#include "support/test_files.h"

namespace tavow3::test {

bool BindReadOnly(const std::string& dir) {
  MakeDirs(dir);
  return ::mount(dir.c_str(), dir.c_str(), nullptr, MS_BIND, nullptr) == 0 &&
         ::mount(nullptr, dir.c_str(), nullptr, MS_BIND | MS_REMOUNT | MS_RDONLY, nullptr) == 0;
}

bool MountTmpfs(const std::string& dir, const std::string& options) {
  MakeDirs(dir);
  return ::mount("tmpfs", dir.c_str(), "tmpfs", 0, options.c_str()) == 0;
}

bool SetImmutable(const std::string& path, bool immutable) {
  const int fd = ::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
  if (fd < 0) return false;
  int flags = 0;
  bool ok = ::ioctl(fd, FS_IOC_GETFLAGS, &flags) == 0;
  flags = immutable ? (flags | FS_IMMUTABLE_FL) : (flags & ~FS_IMMUTABLE_FL);
  ok = ok && ::ioctl(fd, FS_IOC_SETFLAGS, &flags) == 0;
  ::close(fd);
  return ok;
}

ScopedMount ScopedMount::Tmpfs(const std::string& dir, const std::string& options) {
  if (::mount("tmpfs", dir.c_str(), "tmpfs", 0, options.c_str()) != 0) return ScopedMount("");
  return ScopedMount(dir);
}

ScopedMount ScopedMount::ReadOnly(const std::string& dir) {
  if (::mount(dir.c_str(), dir.c_str(), nullptr, MS_BIND, nullptr) != 0) return ScopedMount("");
  if (::mount(nullptr, dir.c_str(), nullptr, MS_BIND | MS_REMOUNT | MS_RDONLY, nullptr) != 0) {
    const int error = errno;
    (void)::umount2(dir.c_str(), MNT_DETACH);
    errno = error;
    return ScopedMount("");
  }
  return ScopedMount(dir);
}

ScopedMount::~ScopedMount() {
  if (!dir_.empty()) (void)::umount2(dir_.c_str(), MNT_DETACH);
}

}  // namespace tavow3::test
