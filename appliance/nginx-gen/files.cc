#include "files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace tavonginxgen {
namespace {

std::string Describe(const std::string& what, const std::string& path) {
  return what + " " + path + ": " + std::strerror(errno);
}

void ReadAll(int fd, std::string* out) {
  char buffer[4096];
  for (;;) {
    const ssize_t n = ::read(fd, buffer, sizeof buffer);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) return;
    out->append(buffer, static_cast<size_t>(n));
  }
}

}  // namespace

bool MakeDirectories(const std::string& path, std::string* error) {
  for (size_t slash = path.find('/', 1);; slash = path.find('/', slash + 1)) {
    const std::string part = path.substr(0, slash);
    struct stat st;
    if (::stat(part.c_str(), &st) == 0) {
      if (!S_ISDIR(st.st_mode)) {
        errno = ENOTDIR;
        *error = Describe("cannot create directory", part);
        return false;
      }
    } else if (::mkdir(part.c_str(), 0755) != 0 && errno != EEXIST) {
      *error = Describe("cannot create directory", part);
      return false;
    }
    if (slash == std::string::npos) return true;
  }
}

int RunCollecting(const std::vector<std::string>& argv, std::string* output) {
  int fds[2];
  if (::pipe2(fds, O_CLOEXEC) != 0) {
    *output = Describe("cannot make a pipe for", argv[0]);
    return -1;
  }
  const pid_t pid = ::fork();
  if (pid == 0) {
    const int null = ::open("/dev/null", O_RDONLY);
    if (null < 0 || ::dup2(null, STDIN_FILENO) < 0 || ::dup2(fds[1], STDOUT_FILENO) < 0 ||
        ::dup2(fds[1], STDERR_FILENO) < 0) {
      ::_exit(127);
    }
    std::vector<char*> args;
    for (const std::string& arg : argv) args.push_back(const_cast<char*>(arg.c_str()));
    args.push_back(nullptr);
    ::execv(args[0], args.data());
    ::_exit(127);
  }
  ::close(fds[1]);
  if (pid < 0) {
    ::close(fds[0]);
    *output = Describe("cannot start", argv[0]);
    return -1;
  }
  ReadAll(fds[0], output);
  ::close(fds[0]);
  int status = 0;
  while (::waitpid(pid, &status, 0) < 0) {
    if (errno != EINTR) return -1;
  }
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

bool FileExists(const std::string& path) {
  struct stat st;
  return ::stat(path.c_str(), &st) == 0;
}

}  // namespace tavonginxgen
