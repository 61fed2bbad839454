// Small helpers shared by the settings tests.
#ifndef TAVOW3_TESTS_SETTINGS_SETTINGS_TEST_UTIL_H_
#define TAVOW3_TESTS_SETTINGS_SETTINGS_TEST_UTIL_H_

#include <sys/types.h>

#include <string>
#include <vector>

namespace tavow3::test {

// Writes `bytes` to `path` directly (test set-up only), creating parents.
void WriteRaw(const std::string& path, const std::string& bytes);
// The file's bytes, or "<missing>".
std::string ReadRaw(const std::string& path);
// Names in `dir`, sorted; empty when it is missing.
std::vector<std::string> DirNames(const std::string& dir);
// Runs argv and asserts it exits 0 (mount, mkdir and the like).
void MustRun(const std::vector<std::string>& argv);

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_SETTINGS_SETTINGS_TEST_UTIL_H_
