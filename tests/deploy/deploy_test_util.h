// Helpers of the deployment tests. They call the C library directly, never
// the library's wrappers, so that armed fault hooks cannot touch them.
#ifndef TAVOW3_TESTS_DEPLOY_DEPLOY_TEST_UTIL_H_
#define TAVOW3_TESTS_DEPLOY_DEPLOY_TEST_UTIL_H_

#include <sys/types.h>

#include <chrono>
#include <functional>
#include <string>
#include <vector>

namespace tavow3::test {

// Writes `bytes` to `path` (parents made), with `mode`.
void WriteFileAt(const std::string& path, const std::string& bytes, mode_t mode = 0644);
// Whole content of `path`, or "<missing>".
std::string FileBytes(const std::string& path);
bool PathExists(const std::string& path);  // lstat: links not followed
bool IsDirectory(const std::string& path);  // lstat
// Content of the symbolic link `path`, or "" when it is none.
std::string LinkTarget(const std::string& path);
// Inode of `path` (lstat), 0 when missing.
ino_t InodeOf(const std::string& path);
// `rm -rf` of `path`.
void RemoveTree(const std::string& path);
// The backups of `path`: "<path>_" followed by six characters, sorted.
std::vector<std::string> BackupsOf(const std::string& path);

// Runs argv (no shell) and returns its exit status; its standard output and
// error go to *output when given.
int RunProgram(const std::vector<std::string>& argv, std::string* output = nullptr);
// Lines of "iptables -S" in this sandbox.
std::vector<std::string> IptablesRules();

// The lines logged with the tag "nginx_deploy" since the last ClearLog().
std::vector<std::string> DeployLog();

// Polls `done` every 10 ms until it is true or `timeout` passed; its last value.
bool WaitUntil(const std::function<bool()>& done,
               std::chrono::milliseconds timeout = std::chrono::seconds(10));

// Process ids of this process's children whose /proc state is `state` ('Z'),
// or of every child when `state` is 0.
std::vector<pid_t> ChildrenInState(char state);

// The nginx files of a deployment: a main configuration in
// /var/tmp/nginx/nginx.conf that includes the three fragment directories
// under /etc/nginx, and the generator script that tests install.
std::string MainConf(const std::string& marker);
extern const char kGeneratorScript[];
// Installs a generator script that appends a line to /tmp/generator.runs and
// writes /var/tmp/nginx/nginx.conf, valid or broken, and one app.d fragment.
void InstallGenerator(bool valid);
// Lines of /tmp/generator.runs.
int GeneratorRuns();

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_DEPLOY_DEPLOY_TEST_UTIL_H_
