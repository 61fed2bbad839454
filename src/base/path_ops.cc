// Calls that name a file by path: rename, unlink, mkdir, chmod, symlinks, stat.
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <vector>

#include "base/fault.h"
#include "base/file_io.h"

namespace tavow3::base {

bool Rename(const std::string& from, const std::string& to) {
  if (fault::Fire(fault::Op::kRename)) return false;
  return ::rename(from.c_str(), to.c_str()) == 0;
}

bool Unlink(const std::string& path) {
  if (fault::Fire(fault::Op::kUnlink)) return false;
  return ::unlink(path.c_str()) == 0;
}

bool Rmdir(const std::string& path) {
  if (fault::Fire(fault::Op::kRmdir)) return false;
  return ::rmdir(path.c_str()) == 0;
}

bool Mkdir(const std::string& path, mode_t mode) {
  if (fault::Fire(fault::Op::kMkdir)) return false;
  return ::mkdir(path.c_str(), mode) == 0;
}

bool Chmod(const std::string& path, mode_t mode) {
  if (fault::Fire(fault::Op::kChmod)) return false;
  return ::chmod(path.c_str(), mode) == 0;
}

bool Chown(const std::string& path, uid_t uid, gid_t gid) {
  if (fault::Fire(fault::Op::kChown)) return false;
  return ::chown(path.c_str(), uid, gid) == 0;
}

bool Symlink(const std::string& target, const std::string& link) {
  if (fault::Fire(fault::Op::kSymlink)) return false;
  return ::symlink(target.c_str(), link.c_str()) == 0;
}

bool Readlink(const std::string& path, std::string* target) {
  if (fault::Fire(fault::Op::kReadlink)) return false;
  // readlink(2) truncates silently; grow until the result leaves room to spare.
  std::vector<char> buffer(256);
  for (;;) {
    const ssize_t length = ::readlink(path.c_str(), buffer.data(), buffer.size());
    if (length < 0) return false;
    if (static_cast<size_t>(length) < buffer.size()) {
      target->assign(buffer.data(), static_cast<size_t>(length));
      return true;
    }
    buffer.resize(buffer.size() * 2);
  }
}

bool Stat(const std::string& path, struct stat* st) {
  if (fault::Fire(fault::Op::kStat)) return false;
  return ::stat(path.c_str(), st) == 0;
}

bool Lstat(const std::string& path, struct stat* st) {
  if (fault::Fire(fault::Op::kStat)) return false;
  return ::lstat(path.c_str(), st) == 0;
}

bool Exists(const std::string& path) {
  struct stat st;
  return Stat(path, &st);
}

}  // namespace tavow3::base
