#include "manager_test_util.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <sstream>
#include <thread>

#include <gtest/gtest.h>

#include "support/syslog_capture.h"

namespace tavow3::test {
namespace {

constexpr size_t kRecordSize = 4096;

std::string ReadFd(int fd) {
  std::string text;
  char buffer[4096];
  ssize_t n;
  while ((n = ::read(fd, buffer, sizeof buffer)) > 0 || (n < 0 && errno == EINTR)) {
    if (n > 0) text.append(buffer, static_cast<size_t>(n));
  }
  return text;
}

std::vector<std::string> OnlyDeployLines(const std::vector<std::string>& lines) {
  std::vector<std::string> deploy;
  for (const std::string& line : lines) {
    if (line.rfind("nginx_deploy:", 0) == 0) deploy.push_back(line);
  }
  return deploy;
}

}  // namespace

void WriteFileAt(const std::string& path, const std::string& bytes, mode_t mode) {
  const std::string dir = path.substr(0, path.rfind('/'));
  if (!dir.empty()) {
    ASSERT_EQ(0, RunCommand({"/bin/mkdir", "-p", dir}).status) << dir;
  }
  {
    std::ofstream out(path, std::ios::trunc | std::ios::binary);
    out << bytes;
    ASSERT_TRUE(out.good()) << path;
  }
  ASSERT_EQ(0, ::chmod(path.c_str(), mode)) << path;
}

std::string FileBytes(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) return "<missing>";
  std::ostringstream out;
  out << in.rdbuf();
  return out.str();
}

bool PathExists(const std::string& path) {
  struct stat st;
  return ::lstat(path.c_str(), &st) == 0;
}

std::string LinkTarget(const std::string& path) {
  char buffer[4096];
  const ssize_t n = ::readlink(path.c_str(), buffer, sizeof buffer);
  return n < 0 ? std::string() : std::string(buffer, static_cast<size_t>(n));
}

void RemoveTree(const std::string& path) {
  ASSERT_EQ(0, RunCommand({"/bin/rm", "-rf", path}).status) << path;
}

std::vector<std::string> ListDir(const std::string& dir) {
  std::vector<std::string> names;
  DIR* d = ::opendir(dir.c_str());
  if (d == nullptr) return names;
  while (dirent* entry = ::readdir(d)) {
    const std::string name = entry->d_name;
    if (name != "." && name != "..") names.push_back(name);
  }
  ::closedir(d);
  std::sort(names.begin(), names.end());
  return names;
}

RunResult RunCommand(const std::vector<std::string>& argv) {
  RunResult result;
  char err_path[] = "/tmp/run-stderr.XXXXXX";
  const int err_fd = ::mkstemp(err_path);
  int fds[2];
  if (err_fd < 0 || ::pipe2(fds, O_CLOEXEC) != 0) return result;
  const pid_t pid = ::fork();
  if (pid == 0) {
    const int null = ::open("/dev/null", O_RDONLY);
    ::dup2(null, STDIN_FILENO);
    ::dup2(fds[1], STDOUT_FILENO);
    ::dup2(err_fd, STDERR_FILENO);
    std::vector<char*> args;
    for (const std::string& arg : argv) args.push_back(const_cast<char*>(arg.c_str()));
    args.push_back(nullptr);
    ::execv(args[0], args.data());
    ::_exit(127);
  }
  ::close(fds[1]);
  result.out = ReadFd(fds[0]);
  ::close(fds[0]);
  int status = 0;
  while (pid > 0 && ::waitpid(pid, &status, 0) < 0 && errno == EINTR) {
  }
  if (pid > 0 && WIFEXITED(status)) result.status = WEXITSTATUS(status);
  ::close(err_fd);
  result.err = FileBytes(err_path);
  ::unlink(err_path);
  return result;
}

std::vector<std::string> IptablesRules() {
  const RunResult run = RunCommand({"/usr/bin/iptables", "-S"});
  EXPECT_EQ(0, run.status) << run.err;
  std::vector<std::string> lines;
  std::istringstream in(run.out);
  for (std::string line; std::getline(in, line);) lines.push_back(line);
  return lines;
}

bool HasDefaultRule() {
  const std::vector<std::string> rules = IptablesRules();
  return std::find(rules.begin(), rules.end(), kDefaultRule) != rules.end();
}

void WriteModeRecord(const std::string& text) {
  const int fd = ::shm_open("nginx_mod", O_RDWR | O_CREAT, 0644);
  ASSERT_GE(fd, 0) << std::strerror(errno);
  ASSERT_EQ(0, ::ftruncate(fd, kRecordSize));
  char record[kRecordSize] = {};
  std::memcpy(record, text.data(), std::min(text.size(), kRecordSize));
  ASSERT_EQ(static_cast<ssize_t>(kRecordSize), ::pwrite(fd, record, kRecordSize, 0));
  ::close(fd);
}

std::string ModeRecordText() {
  const int fd = ::shm_open("nginx_mod", O_RDONLY, 0);
  if (fd < 0) return "<none>";
  char record[kRecordSize + 1] = {};
  const ssize_t n = ::pread(fd, record, kRecordSize, 0);
  ::close(fd);
  return n < 0 ? "<unreadable>" : std::string(record);
}

std::vector<std::string> DeployLog() { return OnlyDeployLines(LogMessages()); }

std::vector<std::string> DeployLog(int priority) {
  return OnlyDeployLines(LogMessages(priority));
}

void BreakFirewallFile() {
  RemoveTree("/usr/tavo/etc/services.d/tavow3.sc");
  WriteFileAt("/usr/tavo/etc/services.d/tavow3.sc/keep", "");
}

void BreakCertificates() { WriteFileAt("/usr/tavo/etc/tls/services.json", "not json"); }

void PretendNginxRuns() { WriteFileAt("/run/nginx.pid", std::to_string(::getpid()) + "\n"); }

bool WaitUntil(const std::function<bool()>& done, std::chrono::milliseconds timeout) {
  const auto deadline = std::chrono::steady_clock::now() + timeout;
  while (!done()) {
    if (std::chrono::steady_clock::now() >= deadline) return done();
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
  }
  return true;
}

std::string Fetch(const std::string& url) {
  const RunResult run = RunCommand({"/usr/bin/curl", "-sSk", "--max-time", "5", url});
  return run.status == 0 ? run.out : "<no answer>";
}

}  // namespace tavow3::test
