// File and directory helpers of the tests. They call the C library directly,
// never the library's wrappers, so that armed fault hooks cannot touch them.
#ifndef TAVOW3_TESTS_SUPPORT_TEST_FILES_H_
#define TAVOW3_TESTS_SUPPORT_TEST_FILES_H_

#include <json/value.h>
#include <sys/types.h>

#include <string>
#include <vector>

namespace tavow3::test {

// Writes `bytes` to `path`, creating missing parent directories; fails the
// test on error. A new file gets mode 0644, an existing one keeps its mode.
void WriteBytes(const std::string& path, const std::string& bytes);
// The same, then gives the file `mode`.
void WriteBytes(const std::string& path, const std::string& bytes, mode_t mode);
// Whole content of `path`, or "<missing>" when it cannot be read.
std::string ReadBytes(const std::string& path);

bool PathExists(const std::string& path);   // lstat: links not followed
bool IsDirectory(const std::string& path);  // lstat
// Content of the symbolic link `path`, or "" when it is none.
std::string LinkTarget(const std::string& path);
// Inode of `path` (lstat) or of the file open on `fd`; 0 when there is none.
ino_t InodeOf(const std::string& path);
ino_t InodeOf(int fd);
// Permission bits of `path` (lstat), 0 when it is missing.
mode_t ModeOf(const std::string& path);

// Creates `dir` and its missing parents (mode 0755); fails the test on error.
void MakeDirs(const std::string& dir);
// Removes `path` and everything below it; a missing path is fine.
void RemoveTree(const std::string& path);
// Makes `path` an empty directory (removing what was there) and returns it.
std::string FreshDir(const std::string& path);
// Entry names of `dir` without "." and "..", sorted; empty when it is missing.
std::vector<std::string> DirNames(const std::string& dir);
// Lines of `text`, without their newlines.
std::vector<std::string> Lines(const std::string& text);

// The JSON document `text`; fails the test and gives null when it is malformed.
Json::Value ParseJson(const std::string& text);
// ParseJson() of the file `path`.
Json::Value ReadJson(const std::string& path);

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_SUPPORT_TEST_FILES_H_
