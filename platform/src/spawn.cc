#include "spawn.h"

#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>

extern char** environ;

namespace tavo::internal {
namespace {

// Owns the posix_spawn attribute and file-action objects of one start.
class SpawnSetup {
 public:
  SpawnSetup() {
    attr_ok_ = ::posix_spawnattr_init(&attr_) == 0;
    actions_ok_ = ::posix_spawn_file_actions_init(&actions_) == 0;
  }
  ~SpawnSetup() {
    if (attr_ok_) ::posix_spawnattr_destroy(&attr_);
    if (actions_ok_) ::posix_spawn_file_actions_destroy(&actions_);
  }
  SpawnSetup(const SpawnSetup&) = delete;
  SpawnSetup& operator=(const SpawnSetup&) = delete;

  // Fills in both objects from `spec`; returns 0 or an error number.
  int Prepare(const SpawnSpec& spec);

  const posix_spawnattr_t* attr() const { return &attr_; }
  const posix_spawn_file_actions_t* actions() const { return &actions_; }

 private:
  int PrepareAttributes(const SpawnSpec& spec);
  int PrepareActions(const SpawnSpec& spec);

  posix_spawnattr_t attr_;
  posix_spawn_file_actions_t actions_;
  bool attr_ok_ = false;
  bool actions_ok_ = false;
};

int SpawnSetup::Prepare(const SpawnSpec& spec) {
  if (!attr_ok_ || !actions_ok_) return ENOMEM;
  int rc = PrepareAttributes(spec);
  return rc != 0 ? rc : PrepareActions(spec);
}

int SpawnSetup::PrepareAttributes(const SpawnSpec& spec) {
  // A caller that ignores SIGPIPE or blocks signals must not pass that on.
  sigset_t all;
  sigset_t none;
  sigfillset(&all);
  sigdelset(&all, SIGKILL);
  sigdelset(&all, SIGSTOP);
  sigemptyset(&none);
  short flags = POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK;
  if (spec.new_session) flags |= POSIX_SPAWN_SETSID;
  int rc = ::posix_spawnattr_setsigdefault(&attr_, &all);
  if (rc == 0) rc = ::posix_spawnattr_setsigmask(&attr_, &none);
  if (rc == 0) rc = ::posix_spawnattr_setflags(&attr_, flags);
  return rc;
}

int SpawnSetup::PrepareActions(const SpawnSpec& spec) {
  int rc = 0;
  if (spec.null_stdin) {
    rc = ::posix_spawn_file_actions_addopen(&actions_, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
  }
  if (rc == 0 && spec.stdout_fd >= 0) {
    rc = ::posix_spawn_file_actions_adddup2(&actions_, spec.stdout_fd, STDOUT_FILENO);
  } else if (rc == 0 && spec.null_stdout) {
    rc = ::posix_spawn_file_actions_addopen(&actions_, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
  }
  if (rc == 0 && spec.stderr_to_stdout) {
    rc = ::posix_spawn_file_actions_adddup2(&actions_, STDOUT_FILENO, STDERR_FILENO);
  } else if (rc == 0 && spec.null_stderr) {
    rc = ::posix_spawn_file_actions_addopen(&actions_, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
  }
  if (rc == 0 && spec.close_fds) {
    rc = ::posix_spawn_file_actions_addclosefrom_np(&actions_, STDERR_FILENO + 1);
  }
  return rc;
}

}  // namespace

pid_t Spawn(const SpawnSpec& spec) {
  if (spec.argv == nullptr || spec.argv[0] == nullptr) {
    errno = EINVAL;
    return -1;
  }
  SpawnSetup setup;
  int rc = setup.Prepare(spec);
  pid_t pid = -1;
  if (rc == 0) {
    // posix_spawn's prototype predates const-correct vectors; it does not
    // modify them.
    char* const* argv = const_cast<char* const*>(spec.argv);
    char* const* envp = spec.envp != nullptr ? const_cast<char* const*>(spec.envp) : environ;
    rc = spec.search_path
             ? ::posix_spawnp(&pid, spec.argv[0], setup.actions(), setup.attr(), argv, envp)
             : ::posix_spawn(&pid, spec.argv[0], setup.actions(), setup.attr(), argv, envp);
  }
  if (rc != 0) {
    errno = rc;
    return -1;
  }
  return pid;
}

int WaitExitStatus(pid_t pid) {
  int status = 0;
  pid_t rc;
  do {
    rc = ::waitpid(pid, &status, 0);
  } while (rc < 0 && errno == EINTR);
  if (rc < 0) return -1;
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

int SpawnAndWait(const SpawnSpec& spec) {
  pid_t pid = Spawn(spec);
  return pid < 0 ? -1 : WaitExitStatus(pid);
}

}  // namespace tavo::internal
