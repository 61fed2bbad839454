// File and mount helpers for the base tests. They use the standard library
// and mount(2) directly, never the wrappers under test or their fault hooks.
#ifndef TAVOW3_TESTS_BASE_TEST_UTIL_H_
#define TAVOW3_TESTS_BASE_TEST_UTIL_H_

#include <string>
#include <utility>
#include <vector>

namespace tavow3::test {

// Makes `path` an empty directory (removing what was there) and returns it.
std::string FreshDir(const std::string& path);
// Whole content of `path`, or "<missing>" when it cannot be opened.
std::string ReadBytes(const std::string& path);
void WriteBytes(const std::string& path, const std::string& bytes);
// Entry names of `dir`, sorted.
std::vector<std::string> Names(const std::string& dir);

// A mount over a directory, detached again on destruction; ok() is false
// (errno set) when mounting failed.
class ScopedMount {
 public:
  // A tmpfs with `options` ("size=64k") on `dir`.
  static ScopedMount Tmpfs(const std::string& dir, const std::string& options);
  // `dir` bind-mounted on itself read-only.
  static ScopedMount ReadOnly(const std::string& dir);
  ScopedMount(ScopedMount&& other) noexcept : dir_(std::move(other.dir_)) { other.dir_.clear(); }
  ~ScopedMount();
  ScopedMount(const ScopedMount&) = delete;
  ScopedMount& operator=(const ScopedMount&) = delete;

  bool ok() const { return !dir_.empty(); }

 private:
  explicit ScopedMount(std::string dir) : dir_(std::move(dir)) {}
  std::string dir_;
};

bool IsCloseOnExec(int fd);
// Inode number of the file open on `fd`.
unsigned long InodeOf(int fd);
// Returns once thread `tid` of this process sleeps in a kernel function whose
// name contains `function` ("pipe_write").
void WaitUntilBlockedIn(int tid, const std::string& function);
// Number of open descriptors of this process.
int OpenDescriptors();
// True while /proc has an entry for `pid` (running or not yet reaped).
bool ProcessExists(int pid);

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_BASE_TEST_UTIL_H_
