// ChildProcess and Spawn: argument vectors started with posix_spawn(3).
#include "base/child_process.h"

#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>

#include "base/fault.h"

extern char** environ;

namespace tavow3::base {
namespace {

constexpr int kFirstRealtimeSignal = 32;

// Kills a child nobody waited for and reaps it, keeping errno. When the kill
// fails for another reason than the child being gone, waiting could block
// for ever, so the child is left alone.
void KillAndReap(pid_t pid) noexcept {
  if (pid <= 0) return;
  const int saved_errno = errno;
  if (Kill(pid, SIGKILL) || errno == ESRCH) {
    int status;
    (void)WaitPid(pid, &status, 0);
  }
  errno = saved_errno;
}

// posix_spawn's file actions and attributes, destroyed on every return path.
class SpawnSetup {
 public:
  SpawnSetup() {
    error_ = ::posix_spawn_file_actions_init(&actions_);
    if (error_ == 0) error_ = ::posix_spawnattr_init(&attributes_);
  }
  ~SpawnSetup() {
    (void)::posix_spawnattr_destroy(&attributes_);
    (void)::posix_spawn_file_actions_destroy(&actions_);
  }
  SpawnSetup(const SpawnSetup&) = delete;
  SpawnSetup& operator=(const SpawnSetup&) = delete;

  // Applies `options`; the first error is kept in error().
  void Configure(const SpawnOptions& options) {
    if (options.null_stdin) OpenNull(STDIN_FILENO, O_RDONLY);
    if (options.stdout_fd >= 0) {
      Check(::posix_spawn_file_actions_adddup2(&actions_, options.stdout_fd, STDOUT_FILENO));
    } else if (options.null_stdout) {
      OpenNull(STDOUT_FILENO, O_WRONLY);
    }
    if (options.stderr_to_stdout) {
      Check(::posix_spawn_file_actions_adddup2(&actions_, STDOUT_FILENO, STDERR_FILENO));
    } else if (options.null_stderr) {
      OpenNull(STDERR_FILENO, O_WRONLY);
    }
    // The child starts with no blocked signals and default dispositions, whatever
    // the caller ignores (SIGPIPE, SIGCHLD). Only the classic signals 1-31: glibc
    // keeps the first real-time signals for itself.
    sigset_t signals;
    sigemptyset(&signals);
    Check(::posix_spawnattr_setsigmask(&attributes_, &signals));
    for (int sig = 1; sig < kFirstRealtimeSignal; ++sig) {
      if (sig != SIGKILL && sig != SIGSTOP) sigaddset(&signals, sig);
    }
    Check(::posix_spawnattr_setsigdefault(&attributes_, &signals));
    short flags = POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF;
    if (options.new_session) flags |= POSIX_SPAWN_SETSID;
    Check(::posix_spawnattr_setflags(&attributes_, flags));
  }

  int error() const { return error_; }
  const posix_spawn_file_actions_t* actions() const { return &actions_; }
  const posix_spawnattr_t* attributes() const { return &attributes_; }

 private:
  void Check(int error) {
    if (error_ == 0) error_ = error;
  }
  void OpenNull(int fd, int flags) {
    Check(::posix_spawn_file_actions_addopen(&actions_, fd, "/dev/null", flags, 0));
  }

  posix_spawn_file_actions_t actions_;
  posix_spawnattr_t attributes_;
  int error_ = 0;
};

}  // namespace

ChildProcess& ChildProcess::operator=(ChildProcess&& other) noexcept {
  if (this != &other) {
    KillAndReap(Release());
    pid_ = other.Release();
  }
  return *this;
}

ChildProcess::~ChildProcess() { KillAndReap(Release()); }

int ChildProcess::Wait() {
  const pid_t pid = Release();
  if (pid <= 0) {
    errno = ECHILD;
    return -1;
  }
  int status;
  if (WaitPid(pid, &status, 0) != pid) return -1;
  return ExitStatus(status);
}

pid_t ChildProcess::Release() noexcept {
  const pid_t pid = pid_;
  pid_ = -1;
  return pid;
}

ChildProcess Spawn(const std::vector<std::string>& argv, const SpawnOptions& options) {
  if (fault::Fire(fault::Op::kSpawn)) return ChildProcess();
  if (argv.empty()) {
    errno = EINVAL;
    return ChildProcess();
  }
  std::vector<char*> args;
  args.reserve(argv.size() + 1);
  for (const std::string& arg : argv) args.push_back(const_cast<char*>(arg.c_str()));
  args.push_back(nullptr);

  SpawnSetup setup;
  if (setup.error() == 0) setup.Configure(options);
  if (setup.error() != 0) {
    errno = setup.error();
    return ChildProcess();
  }
  // glibc's posix_spawn waits until the exec has happened, so a missing or
  // unrunnable program comes back here as the exec's error, not as exit 127.
  pid_t pid;
  const int error =
      ::posix_spawn(&pid, args[0], setup.actions(), setup.attributes(), args.data(), environ);
  if (error != 0) {
    errno = error;
    return ChildProcess();
  }
  return ChildProcess(pid);
}

int Run(const std::vector<std::string>& argv, const SpawnOptions& options) {
  ChildProcess child = Spawn(argv, options);
  if (!child) return -1;
  return child.Wait();
}

}  // namespace tavow3::base
