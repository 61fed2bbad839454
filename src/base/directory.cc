// Directory listings: glob(3) patterns and the entries of one directory.
#include <dirent.h>
#include <glob.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "base/fault.h"
#include "base/file_io.h"

namespace tavow3::base {

bool Glob(const std::string& pattern, std::vector<std::string>* paths) {
  if (fault::Fire(fault::Op::kGlob)) return false;
  glob_t matches;
  std::memset(&matches, 0, sizeof matches);
  const int result = ::glob(pattern.c_str(), 0, nullptr, &matches);
  if (result != 0 && result != GLOB_NOMATCH) {
    ::globfree(&matches);
    errno = result == GLOB_NOSPACE ? ENOMEM : EIO;
    return false;
  }
  std::vector<std::string> found(matches.gl_pathv, matches.gl_pathv + matches.gl_pathc);
  ::globfree(&matches);
  std::sort(found.begin(), found.end());  // byte order, whatever the locale
  *paths = std::move(found);
  return true;
}

bool ListDir(const std::string& path, std::vector<std::string>* names) {
  if (fault::Fire(fault::Op::kOpendir)) return false;
  DIR* dir = ::opendir(path.c_str());  // glibc opens it close-on-exec
  if (dir == nullptr) return false;
  std::vector<std::string> found;
  for (;;) {
    errno = 0;
    const struct dirent* entry = ::readdir(dir);
    if (entry == nullptr) break;
    if (std::strcmp(entry->d_name, ".") == 0 || std::strcmp(entry->d_name, "..") == 0) continue;
    found.emplace_back(entry->d_name);
  }
  const int read_errno = errno;
  ::closedir(dir);
  if (read_errno != 0) {
    errno = read_errno;
    return false;
  }
  std::sort(found.begin(), found.end());
  *names = std::move(found);
  return true;
}

}  // namespace tavow3::base
