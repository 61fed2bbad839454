// Process, waiting and network helpers of the tests. They call the C library
// directly, never the library's wrappers, so that armed fault hooks cannot
// touch them.
#ifndef TAVOW3_TESTS_SUPPORT_TEST_PROCESS_H_
#define TAVOW3_TESTS_SUPPORT_TEST_PROCESS_H_

#include <sys/types.h>

#include <chrono>
#include <functional>
#include <string>
#include <vector>

namespace tavow3::test {

struct RunResult {
  int status = -1;  // exit status, or -1 when killed or not run
  std::string out;
  std::string err;
};
// Runs argv (no shell) with standard input from /dev/null and waits.
RunResult RunCommand(const std::vector<std::string>& argv);
// Runs argv and fails the test unless it exits 0 (mount, mkdir and the like).
void MustRun(const std::vector<std::string>& argv);

// Polls `done` every 10 ms until it is true or `timeout` passed; its last value.
bool WaitUntil(const std::function<bool()>& done,
               std::chrono::milliseconds timeout = std::chrono::seconds(15));

// The body that `url` serves (curl, certificates not checked), or "<no answer>".
std::string Fetch(const std::string& url);
// A TCP socket of this process listening on 127.0.0.1:`port`, closed on
// destruction: a foreign (non-nginx) process holding the port.
class LoopbackListener {
 public:
  explicit LoopbackListener(unsigned short port);
  ~LoopbackListener();
  LoopbackListener(const LoopbackListener&) = delete;
  LoopbackListener& operator=(const LoopbackListener&) = delete;

  bool listening() const { return listening_; }

 private:
  int fd_;
  bool listening_ = false;
};

// Lines of "iptables -S" in this sandbox.
std::vector<std::string> IptablesRules();

// Whether a new open file description of `path` gets the flock `operation`
// (LOCK_EX, LOCK_SH) now; false when the file cannot be opened.
bool CanFlock(const std::string& path, int operation);

// True while /proc/locks shows process `pid` waiting for an flock.
bool IsWaitingForFlock(pid_t pid);

// Process ids of this process's children whose /proc state is `state` ('Z'),
// or of every child when `state` is 0.
std::vector<pid_t> ChildrenInState(char state);
// True while /proc has an entry for `pid` (running or not yet reaped).
bool ProcessExists(int pid);
// Number of open descriptors of this process.
int OpenDescriptors();
bool IsCloseOnExec(int fd);
// Returns once thread `tid` of this process sleeps in a kernel function whose
// name contains `function` ("pipe_write").
void WaitUntilBlockedIn(int tid, const std::string& function);

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_SUPPORT_TEST_PROCESS_H_
