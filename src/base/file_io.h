// File system calls. Each system call appears once here; every function calls
// the fault hook first, retries EINTR, finishes short reads and writes, uses
// O_CLOEXEC, never logs, and returns false (or an invalid object) with errno
// set on failure.
#ifndef TAVOW3_SRC_BASE_FILE_IO_H_
#define TAVOW3_SRC_BASE_FILE_IO_H_

#include <sys/stat.h>
#include <sys/types.h>

#include <string>
#include <string_view>
#include <vector>

#include "base/export.h"
#include "base/unique_fd.h"

namespace tavow3::base {

// open(2) with O_CLOEXEC added.
TAVOW3_INTERNAL UniqueFd Open(const std::string& path, int flags, mode_t mode = 0);
// mkstemp(3) on `pattern` (ending in "XXXXXX"); the created name goes to *path.
TAVOW3_INTERNAL UniqueFd MakeTemp(const std::string& pattern, std::string* path);

// pipe2(2) with O_CLOEXEC; its fault point is kOpen. Leaves both outputs
// unchanged on failure.
TAVOW3_INTERNAL bool Pipe(UniqueFd* read_end, UniqueFd* write_end);

// Reads until end of file, appending to *out (unchanged on failure).
TAVOW3_INTERNAL bool ReadAll(int fd, std::string* out);
// Reads up to `size` bytes once; returns the count or -1.
TAVOW3_INTERNAL long ReadSome(int fd, char* buffer, unsigned long size);
TAVOW3_INTERNAL bool WriteAll(int fd, std::string_view bytes);
TAVOW3_INTERNAL bool Fsync(int fd);
TAVOW3_INTERNAL bool Fchmod(int fd, mode_t mode);
TAVOW3_INTERNAL bool Fchown(int fd, uid_t uid, gid_t gid);

// Whole-file read of `path` into *out (replacing its content).
TAVOW3_INTERNAL bool ReadFile(const std::string& path, std::string* out);

TAVOW3_INTERNAL bool Rename(const std::string& from, const std::string& to);
TAVOW3_INTERNAL bool Unlink(const std::string& path);
TAVOW3_INTERNAL bool Rmdir(const std::string& path);
TAVOW3_INTERNAL bool Mkdir(const std::string& path, mode_t mode);
TAVOW3_INTERNAL bool Chmod(const std::string& path, mode_t mode);
TAVOW3_INTERNAL bool Chown(const std::string& path, uid_t uid, gid_t gid);
TAVOW3_INTERNAL bool Symlink(const std::string& target, const std::string& link);
// readlink(2) into *target.
TAVOW3_INTERNAL bool Readlink(const std::string& path, std::string* target);
TAVOW3_INTERNAL bool Stat(const std::string& path, struct stat* st);
TAVOW3_INTERNAL bool Lstat(const std::string& path, struct stat* st);
// True when `path` exists (stat follows links); false with errno otherwise.
TAVOW3_INTERNAL bool Exists(const std::string& path);

// Owner and mode of a file written by ReplaceFile.
struct FileMode {
  uid_t uid;
  gid_t gid;
  mode_t mode;
};

// Replaces `path` with `bytes`: temporary "<path>.XXXXXX" beside it, written,
// owner and mode set, flushed, renamed over `path`. On failure `path` is
// unchanged and the temporary is removed.
TAVOW3_INTERNAL bool ReplaceFile(const std::string& path, std::string_view bytes, const FileMode& mode);

// glob(3) of `pattern` into *paths (sorted). No match is success with an empty list.
TAVOW3_INTERNAL bool Glob(const std::string& pattern, std::vector<std::string>* paths);
// Names in directory `path`, without "." and "..", sorted.
TAVOW3_INTERNAL bool ListDir(const std::string& path, std::vector<std::string>* names);

}  // namespace tavow3::base

#endif  // TAVOW3_SRC_BASE_FILE_IO_H_
