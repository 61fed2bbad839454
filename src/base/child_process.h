// Child processes: argument vectors run with posix_spawn (never a shell), and
// fork for the rare caller that must run code in the child.
#ifndef TAVOW3_SRC_BASE_CHILD_PROCESS_H_
#define TAVOW3_SRC_BASE_CHILD_PROCESS_H_

#include <sys/types.h>

#include <string>
#include <vector>

#include "base/export.h"

namespace tavow3::base {

// Where the child's standard streams go.
struct SpawnOptions {
  bool null_stdin = false;
  bool null_stdout = false;
  bool null_stderr = false;
  int stdout_fd = -1;        // when >= 0, dup'ed to the child's standard output
  bool stderr_to_stdout = false;
  bool new_session = false;
};

// A started child. Killed (SIGKILL) and reaped on destruction unless waited
// for or released.
class TAVOW3_INTERNAL ChildProcess {
 public:
  ChildProcess() = default;
  explicit ChildProcess(pid_t pid) : pid_(pid) {}
  ChildProcess(ChildProcess&& other) noexcept : pid_(other.Release()) {}
  ChildProcess& operator=(ChildProcess&& other) noexcept;
  ~ChildProcess();
  ChildProcess(const ChildProcess&) = delete;
  ChildProcess& operator=(const ChildProcess&) = delete;

  bool valid() const { return pid_ > 0; }
  explicit operator bool() const { return valid(); }
  pid_t pid() const { return pid_; }
  // Waits for the child; returns its exit status (0-255), or -1 when it died by
  // a signal or could not be waited for. The object is empty afterwards.
  int Wait();
  // Forgets the child without waiting (someone else reaps it).
  pid_t Release() noexcept;

 private:
  pid_t pid_ = -1;
};

// Starts argv[0] (a path; no PATH search) with `argv`. Empty strings are passed
// as empty arguments. Invalid object with errno set when it could not start
// (the program missing counts: the exec failure is reported, not exit 127).
TAVOW3_INTERNAL ChildProcess Spawn(const std::vector<std::string>& argv,
                                   const SpawnOptions& options = {});
// Spawn, then Wait. -1 when it could not start.
TAVOW3_INTERNAL int Run(const std::vector<std::string>& argv, const SpawnOptions& options = {});

// fork(2): 0 in the child, the pid in the parent, -1 on failure.
TAVOW3_INTERNAL pid_t Fork();
// waitpid(2) with EINTR retried; stores the raw status.
TAVOW3_INTERNAL pid_t WaitPid(pid_t pid, int* status, int options);
// Exit status (0-255) from a raw wait status, -1 for a signal.
TAVOW3_INTERNAL int ExitStatus(int raw_status);
// kill(2).
TAVOW3_INTERNAL bool Kill(pid_t pid, int sig);
// _exit(2), for a forked child that must not run the parent's exit handlers.
// Has no fault point: it cannot fail.
[[noreturn]] TAVOW3_INTERNAL void Exit(int status);
// Sleeps `seconds`, resuming after signals. Has no fault point: it cannot fail.
TAVOW3_INTERNAL void SleepSeconds(unsigned seconds);

}  // namespace tavow3::base

#endif  // TAVOW3_SRC_BASE_CHILD_PROCESS_H_
