// File, mount and process helpers for the platform tests. They use the
// standard library and system calls directly, never the calls under test.
#ifndef TAVOW3_TESTS_PLATFORM_TEST_UTIL_H_
#define TAVOW3_TESTS_PLATFORM_TEST_UTIL_H_

#include <sys/types.h>

#include <string>
#include <vector>

namespace platform_test {

// Makes `path` an empty directory (removing what was there) and returns it.
std::string FreshDir(const std::string& path);
// Whole content of `path`, or "<missing>" when it cannot be opened.
std::string ReadBytes(const std::string& path);
// Writes `bytes` to `path` (parents created) and gives it `mode`.
void WriteBytes(const std::string& path, const std::string& bytes, mode_t mode = 0644);
// Entry names of `dir`, sorted.
std::vector<std::string> Names(const std::string& dir);
// Lines of `text`, without their newlines.
std::vector<std::string> Lines(const std::string& text);

// Mounts a tmpfs with `options` ("size=64k") on `dir`; false on failure.
bool MountTmpfs(const std::string& dir, const std::string& options);
// Bind-mounts `dir` on itself read-only; false on failure.
bool BindReadOnly(const std::string& dir);
// Sets or clears the immutable attribute (chattr +i) of `path`.
bool SetImmutable(const std::string& path, bool immutable);

// Runs `command` with /bin/sh and returns its standard output.
std::string ShellOutput(const std::string& command);

}  // namespace platform_test

#endif  // TAVOW3_TESTS_PLATFORM_TEST_UTIL_H_
