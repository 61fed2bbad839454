#include "output_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace tavomustache {
namespace {

std::string Describe(const std::string& what, const std::string& path) {
  return what + " " + path + ": " + std::strerror(errno);
}

bool WriteAll(int fd, const std::string& content) {
  size_t done = 0;
  while (done < content.size()) {
    const ssize_t n = ::write(fd, content.data() + done, content.size() - done);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) return false;
    done += static_cast<size_t>(n);
  }
  return true;
}

std::string ParentDirectory(const std::string& path) {
  const size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  if (slash == 0) return "/";
  return path.substr(0, slash);
}

// Makes the rename itself durable. Some file systems refuse fsync on a
// directory; the file's own data is on disk already, so that is not an error.
void SyncDirectory(const std::string& dir) {
  const int fd = ::open(dir.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (fd < 0) return;
  (void)::fsync(fd);
  ::close(fd);
}

}  // namespace

bool ReadWholeFile(const std::string& path, std::string* content, std::string* error) {
  const int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) {
    *error = Describe("cannot open", path);
    return false;
  }
  std::string bytes;
  char buffer[65536];
  for (;;) {
    const ssize_t n = ::read(fd, buffer, sizeof(buffer));
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) {
      *error = Describe("cannot read", path);
      ::close(fd);
      return false;
    }
    if (n == 0) break;
    bytes.append(buffer, static_cast<size_t>(n));
  }
  ::close(fd);
  *content = std::move(bytes);
  return true;
}

int MakeHiddenTemp(const std::string& path, std::string* temp, std::string* error) {
  const size_t slash = path.rfind('/');
  std::string name = path.substr(0, slash + 1) + "." + path.substr(slash + 1) + ".XXXXXX";
  const int fd = ::mkostemp(name.data(), O_CLOEXEC);
  if (fd < 0) {
    *error = Describe("cannot create a temporary file for", path);
    return -1;
  }
  *temp = name;
  return fd;
}

bool WriteFileAtomically(const std::string& path, const std::string& content, std::string* error) {
  std::string temp_path;
  const int fd = MakeHiddenTemp(path, &temp_path, error);
  if (fd < 0) return false;
  bool ok = WriteAll(fd, content) && ::fchmod(fd, 0644) == 0 && ::fsync(fd) == 0;
  if (!ok) *error = Describe("cannot write", temp_path);
  if (::close(fd) != 0 && ok) {
    ok = false;
    *error = Describe("cannot write", temp_path);
  }
  if (ok && ::rename(temp_path.c_str(), path.c_str()) != 0) {
    ok = false;
    *error = Describe("cannot replace", path);
  }
  if (!ok) {
    const int saved = errno;
    (void)::unlink(temp_path.c_str());
    errno = saved;
    return false;
  }
  SyncDirectory(ParentDirectory(path));
  return true;
}

}  // namespace tavomustache
