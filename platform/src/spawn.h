// Starting programs by argument vector with posix_spawn: no shell, and no
// fork of a possibly large caller. Thread-safe.
#ifndef TAVO_PLATFORM_SPAWN_H_
#define TAVO_PLATFORM_SPAWN_H_

#include <sys/types.h>

// Internal to the library: not exported.
#pragma GCC visibility push(hidden)

namespace tavo::internal {

// How to start one program. The child always starts with every signal at its
// default action and an empty signal mask.
struct SpawnSpec {
  const char* const* argv = nullptr;  // null-terminated; argv[0] is the program
  const char* const* envp = nullptr;  // null: the caller's environment
  bool search_path = false;           // look argv[0] up in PATH when it has no slash
  bool null_stdin = false;            // standard input from /dev/null
  bool null_stdout = false;           // standard output to /dev/null
  bool null_stderr = false;           // standard error to /dev/null
  int stdout_fd = -1;                 // when >= 0: becomes standard output
  bool stderr_to_stdout = false;      // standard error goes where standard output goes
  bool close_fds = true;              // the child gets no descriptor above 2
  bool new_session = false;           // setsid in the child
};

// Starts the program. Returns its process id, or -1 with errno set when it
// could not be started (a missing or non-executable program included).
pid_t Spawn(const SpawnSpec& spec);

// Waits for the child `pid`. Returns its exit status (0-255), or -1 when it
// was ended by a signal or could not be waited for (errno set then).
int WaitExitStatus(pid_t pid);

// Spawn followed by WaitExitStatus; -1 when the program could not start.
int SpawnAndWait(const SpawnSpec& spec);

}  // namespace tavo::internal

#pragma GCC visibility pop

#endif  // TAVO_PLATFORM_SPAWN_H_
