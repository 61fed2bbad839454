#include "tavo/tlib_exec.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <mutex>
#include <new>
#include <unordered_map>

#include "file_util.h"
#include "spawn.h"

namespace {

using tavo::internal::Spawn;
using tavo::internal::SpawnSpec;
using tavo::internal::UniqueFd;
using tavo::internal::WaitExitStatus;

constexpr unsigned int kKnownExecFlags = 0xFF;

// The program behind each open stream of TLIBCPopen.
class PopenTable {
 public:
  void Add(FILE* stream, pid_t pid) {
    std::lock_guard<std::mutex> lock(mu_);
    children_[stream] = pid;
  }
  // Removes `stream` and returns its child, or -1 when it is unknown.
  pid_t Take(FILE* stream) {
    std::lock_guard<std::mutex> lock(mu_);
    auto it = children_.find(stream);
    if (it == children_.end()) return -1;
    pid_t pid = it->second;
    children_.erase(it);
    return pid;
  }

 private:
  std::mutex mu_;
  std::unordered_map<FILE*, pid_t> children_;  // Guarded by mu_.
};

PopenTable& Streams() {
  static PopenTable* table = new PopenTable;  // never destroyed: streams may outlive exit handlers
  return *table;
}

}  // namespace

int TLIBCExec(const char* path, const char* arg1, const char* arg2, const char* arg3,
              const char* arg4) {
  const char* argv[6] = {path, arg1, arg2, arg3, arg4, nullptr};
  // Arguments after the first null are not passed.
  for (int i = 1; i < 5; ++i) {
    if (argv[i] == nullptr) {
      for (int j = i; j < 5; ++j) argv[j] = nullptr;
      break;
    }
  }
  SpawnSpec spec;
  spec.argv = argv;
  return tavo::internal::SpawnAndWait(spec);
}

int TLIBCExecl(const char* const argv[], unsigned int flags) {
  if (argv == nullptr || argv[0] == nullptr || (flags & ~kKnownExecFlags) != 0) {
    errno = EINVAL;
    return -1;
  }
  SpawnSpec spec;
  spec.argv = argv;
  spec.search_path = (flags & TLIB_EXEC_SEARCH_PATH) != 0;
  spec.null_stdin = (flags & TLIB_EXEC_NULL_STDIN) != 0;
  spec.null_stdout = (flags & TLIB_EXEC_NULL_STDOUT) != 0;
  spec.null_stderr = (flags & TLIB_EXEC_NULL_STDERR) != 0;
  spec.close_fds = (flags & TLIB_EXEC_CLOSE_FDS) != 0;
  spec.new_session = (flags & TLIB_EXEC_NEW_SESSION) != 0;
  pid_t pid = Spawn(spec);
  if (pid < 0) return -1;
  if ((flags & TLIB_EXEC_WAIT) == 0) return 0;
  int status = WaitExitStatus(pid);
  if ((flags & TLIB_EXEC_STATUS) != 0) return status;
  return status == 0 ? 0 : -1;
}

FILE* TLIBCPopen(const char* const argv[], const char* mode) {
  if (argv == nullptr || argv[0] == nullptr || mode == nullptr || mode[0] != 'r') {
    errno = EINVAL;
    return nullptr;
  }
  int fds[2];
  if (::pipe2(fds, O_CLOEXEC) != 0) return nullptr;
  UniqueFd read_end(fds[0]);
  UniqueFd write_end(fds[1]);
  FILE* stream = ::fdopen(read_end.get(), "r");
  if (stream == nullptr) return nullptr;
  read_end.Release();  // now owned by `stream`

  SpawnSpec spec;
  spec.argv = argv;
  spec.stdout_fd = write_end.get();
  spec.stderr_to_stdout = std::strchr(mode, 'B') != nullptr;
  pid_t pid = Spawn(spec);
  if (pid < 0) {
    int saved = errno;
    (void)::fclose(stream);
    errno = saved;
    return nullptr;
  }
  try {
    Streams().Add(stream, pid);
  } catch (const std::bad_alloc&) {
    // Out of memory: the stream could never be closed by TLIBCPclose, so
    // wait for the program here and report the failure.
    (void)write_end.Close();
    (void)::fclose(stream);
    (void)WaitExitStatus(pid);
    errno = ENOMEM;
    return nullptr;
  }
  return stream;
}

int TLIBCPclose(FILE* stream) {
  pid_t pid = Streams().Take(stream);
  if (pid < 0) {
    errno = ECHILD;
    return -1;
  }
  (void)::fclose(stream);
  return WaitExitStatus(pid);
}
