// Process calls outside posix_spawn: fork, waitpid, kill, _exit, sleeping.
#include <signal.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <cerrno>

#include "base/child_process.h"
#include "base/fault.h"

namespace tavow3::base {

pid_t Fork() {
  if (fault::Fire(fault::Op::kFork)) return -1;
  return ::fork();
}

pid_t WaitPid(pid_t pid, int* status, int options) {
  if (fault::Fire(fault::Op::kWaitpid)) return -1;
  pid_t result;
  do {
    result = ::waitpid(pid, status, options);
  } while (result < 0 && errno == EINTR);
  return result;
}

int ExitStatus(int raw_status) {
  return WIFEXITED(raw_status) ? WEXITSTATUS(raw_status) : -1;
}

bool Kill(pid_t pid, int sig) {
  if (fault::Fire(fault::Op::kKill)) return false;
  return ::kill(pid, sig) == 0;
}

void Exit(int status) { ::_exit(status); }

void SleepSeconds(unsigned seconds) {
  struct timespec remaining = {static_cast<time_t>(seconds), 0};
  while (::nanosleep(&remaining, &remaining) != 0 && errno == EINTR) {
  }
}

}  // namespace tavow3::base
