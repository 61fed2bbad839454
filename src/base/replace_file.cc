// ReplaceFile: the one way settings and generated files are written.
#include <cerrno>

#include "base/fault.h"
#include "base/file_io.h"

namespace tavow3::base {

bool ReplaceFile(const std::string& path, std::string_view bytes, const FileMode& mode) {
  std::string temp;
  UniqueFd fd = MakeTemp(path + ".XXXXXX", &temp);  // beside path, so rename stays atomic
  // Owner before mode: chown clears set-id bits. The close is checked because
  // some file systems report a failed write-back only there.
  bool ok = fd.valid() && WriteAll(fd.get(), bytes) && Fchown(fd.get(), mode.uid, mode.gid) &&
            Fchmod(fd.get(), mode.mode) && Fsync(fd.get());
  const int first_errno = errno;
  const bool closed = fd.Reset();
  if (!ok) errno = first_errno;
  ok = ok && closed && Rename(temp, path);
  if (!ok && !temp.empty()) {
    const int saved_errno = errno;
    (void)Unlink(temp);  // never leave a temporary behind
    errno = saved_errno;
  }
  return ok;
}

}  // namespace tavow3::base
