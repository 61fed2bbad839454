#include "support/test_process.h"

#include <arpa/inet.h>
#include <dirent.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <sstream>
#include <thread>

#include <gtest/gtest.h>

#include "support/test_files.h"

namespace tavow3::test {
namespace {

std::string ReadToEnd(int fd) {
  std::string text;
  char buffer[4096];
  ssize_t n;
  while ((n = ::read(fd, buffer, sizeof buffer)) > 0 || (n < 0 && errno == EINTR)) {
    if (n > 0) text.append(buffer, static_cast<size_t>(n));
  }
  return text;
}

}  // namespace

RunResult RunCommand(const std::vector<std::string>& argv) {
  RunResult result;
  // Standard error goes to a file so that neither stream can block the other.
  char err_path[] = "/tmp/run-stderr.XXXXXX";
  const int err_fd = ::mkostemp(err_path, O_CLOEXEC);
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
  result.out = ReadToEnd(fds[0]);
  ::close(fds[0]);
  int status = 0;
  while (pid > 0 && ::waitpid(pid, &status, 0) < 0 && errno == EINTR) {
  }
  if (pid > 0 && WIFEXITED(status)) result.status = WEXITSTATUS(status);
  ::close(err_fd);
  result.err = ReadBytes(err_path);
  ::unlink(err_path);
  return result;
}

void MustRun(const std::vector<std::string>& argv) {
  const RunResult run = RunCommand(argv);
  std::string command;
  for (const std::string& arg : argv) command += (command.empty() ? "" : " ") + arg;
  ASSERT_EQ(0, run.status) << command << ": " << run.err;
}

bool WaitUntil(const std::function<bool()>& done, std::chrono::milliseconds timeout) {
  const auto deadline = std::chrono::steady_clock::now() + timeout;
  while (!done()) {
    if (std::chrono::steady_clock::now() >= deadline) return done();
    std::this_thread::sleep_for(std::chrono::milliseconds(10));
  }
  return true;
}

std::string Fetch(const std::string& url) {
  const RunResult run = RunCommand({"/usr/bin/curl", "-sSk", "--max-time", "5", url});
  return run.status == 0 ? run.out : "<no answer>";
}

LoopbackListener::LoopbackListener(unsigned short port)
    : fd_(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
  const int on = 1;
  ::setsockopt(fd_, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_port = htons(port);
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  listening_ = ::bind(fd_, reinterpret_cast<sockaddr*>(&address), sizeof address) == 0 &&
               ::listen(fd_, 1) == 0;
}

LoopbackListener::~LoopbackListener() {
  if (fd_ >= 0) ::close(fd_);
}

std::vector<std::string> IptablesRules() {
  const RunResult run = RunCommand({"/usr/bin/iptables", "-S"});
  EXPECT_EQ(0, run.status) << run.err;
  return Lines(run.out);
}

bool CanFlock(const std::string& path, int operation) {
  const int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) return false;
  const bool ok = ::flock(fd, operation | LOCK_NB) == 0;
  ::close(fd);
  return ok;
}

bool IsWaitingForFlock(pid_t pid) {
  std::istringstream locks(ReadBytes("/proc/locks"));
  for (std::string line; std::getline(locks, line);) {
    // "1: -> FLOCK  ADVISORY  WRITE 1234 ..." for a request still waiting.
    std::istringstream fields(line);
    std::string index, arrow, kind, advisory, access;
    pid_t owner = 0;
    fields >> index >> arrow >> kind >> advisory >> access >> owner;
    if (arrow == "->" && kind == "FLOCK" && owner == pid) return true;
  }
  return false;
}

std::vector<pid_t> ChildrenInState(char state) {
  std::vector<pid_t> children;
  DIR* proc = ::opendir("/proc");
  if (proc == nullptr) return children;
  while (const dirent* entry = ::readdir(proc)) {
    const pid_t pid = std::atoi(entry->d_name);
    if (pid <= 0) continue;
    // "pid (comm) S ppid ...": the name may hold spaces, so parse after ')'.
    const std::string stat = ReadBytes("/proc/" + std::to_string(pid) + "/stat");
    const size_t close = stat.rfind(')');
    if (close == std::string::npos) continue;
    std::istringstream fields(stat.substr(close + 1));
    char process_state = 0;
    pid_t ppid = 0;
    fields >> process_state >> ppid;
    if (ppid == ::getpid() && (state == 0 || process_state == state)) children.push_back(pid);
  }
  ::closedir(proc);
  return children;
}

bool ProcessExists(int pid) { return PathExists("/proc/" + std::to_string(pid)); }

int OpenDescriptors() { return static_cast<int>(DirNames("/proc/self/fd").size()); }

bool IsCloseOnExec(int fd) {
  const int flags = ::fcntl(fd, F_GETFD);
  return flags >= 0 && (flags & FD_CLOEXEC) != 0;
}

void WaitUntilBlockedIn(int tid, const std::string& function) {
  const std::string wchan = "/proc/self/task/" + std::to_string(tid) + "/wchan";
  while (ReadBytes(wchan).find(function) == std::string::npos) std::this_thread::yield();
}

}  // namespace tavow3::test
