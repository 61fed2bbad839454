#include "deploy/nginx_links.h"

#include <sys/stat.h>

#include <cerrno>

#include <tavo/tavofs.h>

#include "base/file_io.h"
#include "base/log.h"

namespace tavow3::deploy {
namespace {

constexpr char kLogTag[] = "nginx_deploy";
constexpr mode_t kDirMode = 0755;
// The backup name "<path>_XXXXXX" must fit this buffer size, its NUL included.
constexpr size_t kMaxBackupName = 1024;

// Moves `path` to a new unique name beside it. A regular file replaces the
// placeholder that reserved the name; anything else (a directory) cannot, so
// the placeholder is removed just before the move.
bool MoveToBackup(const std::string& path, bool is_dir) {
  const std::string pattern = path + "_XXXXXX";
  if (pattern.size() >= kMaxBackupName) {
    errno = ENAMETOOLONG;
    return false;
  }
  std::string backup;
  if (!base::MakeTemp(pattern, &backup).valid()) return false;
  if (is_dir && !base::Unlink(backup)) return false;
  if (base::Rename(path, backup)) return true;
  const int saved_errno = errno;
  if (!is_dir) (void)base::Unlink(backup);
  errno = saved_errno;
  return false;
}

}  // namespace

bool RemovePath(const std::string& path) {
  struct stat st;
  const bool is_known = base::Lstat(path, &st);
  if (is_known && S_ISLNK(st.st_mode)) {
    if (base::Unlink(path)) return true;
    TAVOW3_LOG_ERR_AT(471, "Cannot delete link %s, %m", path.c_str());
    return false;
  }
  if (MoveToBackup(path, is_known && S_ISDIR(st.st_mode))) return true;
  TAVOW3_LOG_ERR_AT(483, "failed to backup %s, %m", path.c_str());
  if (base::Unlink(path)) return true;
  TAVOW3_LOG_ERR_AT(485, "failed to delete %s, %m", path.c_str());
  return false;
}

bool MakeLink(const std::string& target, const std::string& link) {
  if (target.empty() || link.empty()) {
    TAVOW3_LOG_ERR_AT(500, "Bad parameter!");
    return false;
  }
  struct stat st;
  const bool target_exists = base::Stat(target, &st);
  const bool target_is_dir = target_exists && S_ISDIR(st.st_mode);
  if (target_exists && !target_is_dir && !RemovePath(target)) return false;
  if (!target_is_dir && TAVOFSMkdirP(target.c_str(), 0, kDirMode) != 0) {
    TAVOW3_LOG_ERR_AT(514, "TAVOFSMkdirP failed (%s, %m)", target.c_str());
    return false;
  }
  if (base::Lstat(link, &st)) {
    std::string current;
    if (S_ISLNK(st.st_mode) && base::Readlink(link, &current) && current == target) return true;
    if (!RemovePath(link)) return false;
  }
  if (!base::Symlink(target, link)) {
    // Reported as success: the nginx test that follows notices a missing fragment.
    TAVOW3_LOG_ERR_AT(533, "Cannot make link from %s to %s, %m", target.c_str(), link.c_str());
  }
  return true;
}

}  // namespace tavow3::deploy
