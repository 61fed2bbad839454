#include "tree_copy.h"

#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <sys/sendfile.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>

namespace tavow3::sandbox {
namespace {

bool Fail(const char* what, const std::string& path) {
  std::fprintf(stderr, "sandbox-init: %s %s: %s\n", what, path.c_str(), std::strerror(errno));
  return false;
}

// Removes whatever non-directory sits at `path`, so that a new one can take
// its place without writing through an old symbolic link.
bool MakeRoom(const std::string& path) {
  if (::unlink(path.c_str()) == 0 || errno == ENOENT) return true;
  return Fail("cannot replace", path);
}

bool CopyFile(int dir_fd, const char* name, const struct stat& st, const std::string& dest) {
  int in = ::openat(dir_fd, name, O_RDONLY | O_CLOEXEC | O_NOFOLLOW);
  if (in < 0) return Fail("cannot read", dest);
  bool ok = MakeRoom(dest);
  int out = ok ? ::open(dest.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600) : -1;
  if (ok && out < 0) ok = Fail("cannot create", dest);
  off_t left = st.st_size;
  while (ok && left > 0) {
    ssize_t n = ::sendfile(out, in, nullptr, static_cast<size_t>(left));
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) ok = Fail("cannot write", dest);
    left -= n;
  }
  const timespec times[2] = {st.st_atim, st.st_mtim};
  if (ok && (::fchown(out, st.st_uid, st.st_gid) != 0 || ::fchmod(out, st.st_mode & 07777) != 0 ||
             ::futimens(out, times) != 0)) {
    ok = Fail("cannot set the owner, mode or time of", dest);
  }
  if (out >= 0 && ::close(out) != 0 && ok) ok = Fail("cannot write", dest);
  ::close(in);
  return ok;
}

bool CopyLink(int dir_fd, const char* name, const struct stat& st, const std::string& dest) {
  char target[PATH_MAX];
  ssize_t n = ::readlinkat(dir_fd, name, target, sizeof target);
  if (n < 0 || static_cast<size_t>(n) >= sizeof target) return Fail("cannot read", dest);
  target[n] = '\0';
  if (!MakeRoom(dest)) return false;
  if (::symlink(target, dest.c_str()) != 0) return Fail("cannot create", dest);
  if (::lchown(dest.c_str(), st.st_uid, st.st_gid) != 0) return Fail("cannot chown", dest);
  return true;
}

bool CopyDirectory(int dir_fd, const struct stat& st, const std::string& dest);

bool CopyEntry(int dir_fd, const char* name, const std::string& dest) {
  struct stat st {};
  if (::fstatat(dir_fd, name, &st, AT_SYMLINK_NOFOLLOW) != 0) return Fail("cannot stat", dest);
  if (S_ISREG(st.st_mode)) return CopyFile(dir_fd, name, st, dest);
  if (S_ISLNK(st.st_mode)) return CopyLink(dir_fd, name, st, dest);
  if (!S_ISDIR(st.st_mode)) {
    errno = EINVAL;
    return Fail("cannot copy (not a file, directory or link)", dest);
  }
  int child = ::openat(dir_fd, name, O_RDONLY | O_DIRECTORY | O_CLOEXEC | O_NOFOLLOW);
  if (child < 0) return Fail("cannot read", dest);
  bool ok = CopyDirectory(child, st, dest);
  ::close(child);
  return ok;
}

// Copies every entry of the directory open as `dir_fd` into `dest`.
bool CopyContents(int dir_fd, const std::string& dest) {
  int list_fd = ::dup(dir_fd);  // fdopendir takes the descriptor over
  DIR* dir = list_fd >= 0 ? ::fdopendir(list_fd) : nullptr;
  if (dir == nullptr) return Fail("cannot list", dest);
  bool ok = true;
  errno = 0;
  while (ok) {
    dirent* entry = ::readdir(dir);
    if (entry == nullptr) {
      if (errno != 0) ok = Fail("cannot list", dest);
      break;
    }
    if (std::strcmp(entry->d_name, ".") == 0 || std::strcmp(entry->d_name, "..") == 0) continue;
    ok = CopyEntry(dir_fd, entry->d_name, dest + "/" + entry->d_name);
    errno = 0;
  }
  ::closedir(dir);
  return ok;
}

bool CopyDirectory(int dir_fd, const struct stat& st, const std::string& dest) {
  struct stat existing {};
  if (::lstat(dest.c_str(), &existing) == 0 && !S_ISDIR(existing.st_mode)) {
    if (!MakeRoom(dest)) return false;
  }
  if (::mkdir(dest.c_str(), 0700) != 0 && errno != EEXIST) return Fail("cannot create", dest);
  if (!CopyContents(dir_fd, dest)) return false;
  // The mode comes last so that a read-only directory can still be filled.
  if (::chown(dest.c_str(), st.st_uid, st.st_gid) != 0 ||
      ::chmod(dest.c_str(), st.st_mode & 07777) != 0) {
    return Fail("cannot set the owner or mode of", dest);
  }
  return true;
}

}  // namespace

bool CopyTree(int source_fd, const std::string& dest) { return CopyContents(source_fd, dest); }

}  // namespace tavow3::sandbox
