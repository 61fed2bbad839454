#include "tavo/tavofs.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <string>

#include "file_util.h"

namespace {

using tavo::internal::Open;
using tavo::internal::ReplaceFile;
using tavo::internal::UniqueFd;
using tavo::internal::WriteAll;

// Makes the one directory `path` whose parent exists. Sets *created when this
// call made it; an existing directory is fine, anything else is ENOTDIR.
bool MakeOneDirectory(const std::string& path, mode_t mode, bool* created) {
  *created = false;
  struct stat st;
  if (::stat(path.c_str(), &st) != 0) {
    if (errno != ENOENT) return false;
    if (::mkdir(path.c_str(), mode) == 0) {
      *created = true;
      return true;
    }
    // Another process may have made it in between.
    if (errno != EEXIST || ::stat(path.c_str(), &st) != 0) return false;
  }
  if (!S_ISDIR(st.st_mode)) {
    errno = ENOTDIR;
    return false;
  }
  return true;
}

int MakeDirectories(const char* path, int flags, bool set_owner, uid_t uid, gid_t gid,
                    mode_t mode) {
  if (path == nullptr || path[0] == '\0' || flags != 0) {
    errno = EINVAL;
    return -1;
  }
  const std::string full(path);
  mode &= 07777;
  std::string::size_type pos = 0;
  while ((pos = full.find_first_not_of('/', pos)) != std::string::npos) {
    std::string::size_type end = full.find('/', pos);
    if (end == std::string::npos) end = full.size();
    std::string prefix = full.substr(0, end);
    bool created = false;
    if (!MakeOneDirectory(prefix, mode, &created)) return -1;
    // mkdir applied the umask; the created directory gets exactly `mode`,
    // after the owner change, which may clear set-id bits.
    if (created && ((set_owner && ::chown(prefix.c_str(), uid, gid) != 0) ||
                    ::chmod(prefix.c_str(), mode) != 0)) {
      return -1;
    }
    pos = end;
  }
  return 0;
}

bool CopyContents(int from, int to) {
  char buffer[65536];
  for (;;) {
    ssize_t n = ::read(from, buffer, sizeof buffer);
    if (n < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    if (n == 0) return true;
    if (!WriteAll(to, std::string_view(buffer, static_cast<size_t>(n)))) return false;
  }
}

}  // namespace

int TAVOFSMkdirP(const char* path, int flags, mode_t mode) {
  return MakeDirectories(path, flags, /*set_owner=*/false, 0, 0, mode);
}

int TAVOFSMkdirP(const char* path, int flags, int set_owner, uid_t uid, gid_t gid, mode_t mode) {
  return MakeDirectories(path, flags, set_owner != 0, uid, gid, mode);
}

int TAVOFileCopy(const char* from, const char* to) {
  if (from == nullptr || to == nullptr || from[0] == '\0' || to[0] == '\0') {
    errno = EINVAL;
    return -1;
  }
  UniqueFd source = Open(from, O_RDONLY | O_NOCTTY);
  if (!source.valid()) return -1;
  struct stat st;
  if (::fstat(source.get(), &st) != 0) return -1;
  if (!S_ISREG(st.st_mode)) {
    errno = S_ISDIR(st.st_mode) ? EISDIR : EINVAL;
    return -1;
  }
  int fd = source.get();
  return ReplaceFile(to, st.st_mode & 07777, [fd](int temp) { return CopyContents(fd, temp); })
             ? 0
             : -1;
}
