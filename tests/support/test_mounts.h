// Mount and file-attribute helpers that make file operations fail for real:
// read-only binds, small full file systems, immutable files. They call the C
// library directly. Each test case runs in its own mount namespace, so a
// mount left in place ends with the case.
#ifndef TAVOW3_TESTS_SUPPORT_TEST_MOUNTS_H_
#define TAVOW3_TESTS_SUPPORT_TEST_MOUNTS_H_

#include <string>
#include <utility>

namespace tavow3::test {

// Creates `dir` when missing and bind-mounts it on itself read-only; false
// (errno set) on failure.
[[nodiscard]] bool BindReadOnly(const std::string& dir);
// Creates `dir` when missing and mounts a tmpfs with `options` ("size=64k")
// on it; false (errno set) on failure.
[[nodiscard]] bool MountTmpfs(const std::string& dir, const std::string& options);
// Sets or clears the immutable attribute (chattr +i) of `path`.
[[nodiscard]] bool SetImmutable(const std::string& path, bool immutable);

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

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_SUPPORT_TEST_MOUNTS_H_
