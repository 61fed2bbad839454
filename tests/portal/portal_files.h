// File helpers of the portal tests (they run as root in a throwaway sandbox).
#ifndef TAVOW3_TESTS_PORTAL_PORTAL_FILES_H_
#define TAVOW3_TESTS_PORTAL_PORTAL_FILES_H_

#include <sys/stat.h>

#include <string>
#include <vector>

namespace tavow3::test {

// Creates `dir` and its parents (mode 0755); fails the test on error.
void MakeDirs(const std::string& dir);
// Removes `path` and everything below it; a missing path is fine.
void RemoveTree(const std::string& path);
// Replaces `path` with `bytes`, creating its parent directories.
void WriteFileBytes(const std::string& path, const std::string& bytes);
// The bytes of `path`; "<missing>" when it cannot be read.
std::string ReadFileBytes(const std::string& path);
// stat(2) of `path`; false when it fails.
bool StatPath(const std::string& path, struct stat* st);
// Names in `dir`, sorted, without "." and "..".
std::vector<std::string> DirNames(const std::string& dir);
// Log lines of `tag` ("validator:...") since the last ClearLog().
std::vector<std::string> TaggedLogLines(const std::string& tag);

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_PORTAL_PORTAL_FILES_H_
