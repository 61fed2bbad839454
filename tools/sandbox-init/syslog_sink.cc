#include "syslog_sink.h"

#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <vector>

namespace tavow3::sandbox {
namespace {

constexpr size_t kMaxMessage = 65536;

bool WriteAll(int fd, const std::string& bytes) {
  size_t done = 0;
  while (done < bytes.size()) {
    ssize_t n = ::write(fd, bytes.data() + done, bytes.size() - done);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) return false;
    done += static_cast<size_t>(n);
  }
  return true;
}

// One message as one line; readers undo the two escapes.
std::string EscapeLine(const char* data, size_t size) {
  while (size > 0 && (data[size - 1] == '\n' || data[size - 1] == '\0')) --size;
  std::string line;
  line.reserve(size + 1);
  for (size_t i = 0; i < size; ++i) {
    if (data[i] == '\\') {
      line += "\\\\";
    } else if (data[i] == '\n') {
      line += "\\n";
    } else {
      line += data[i];
    }
  }
  line += '\n';
  return line;
}

[[noreturn]] void RunSink(int socket_fd, int log_fd) {
  std::vector<char> buffer(kMaxMessage);
  for (;;) {
    ssize_t n = ::recv(socket_fd, buffer.data(), buffer.size(), 0);
    if (n < 0) {
      if (errno == EINTR) continue;
      std::perror("sandbox-init: syslog sink recv");
      ::_exit(1);
    }
    // A single O_APPEND write per message keeps lines whole.
    if (!WriteAll(log_fd, EscapeLine(buffer.data(), static_cast<size_t>(n)))) {
      std::perror("sandbox-init: syslog sink write");
      ::_exit(1);
    }
  }
}

}  // namespace

pid_t StartSyslogSink(const std::string& socket_path, const std::string& log_path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (socket_path.size() >= sizeof address.sun_path) {
    std::fprintf(stderr, "sandbox-init: socket path too long: %s\n", socket_path.c_str());
    return -1;
  }
  std::memcpy(address.sun_path, socket_path.c_str(), socket_path.size() + 1);
  int socket_fd = ::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  if (socket_fd < 0) {
    std::perror("sandbox-init: socket");
    return -1;
  }
  int buffer_size = 4 << 20;
  (void)::setsockopt(socket_fd, SOL_SOCKET, SO_RCVBUFFORCE, &buffer_size, sizeof buffer_size);
  (void)::unlink(socket_path.c_str());
  if (::bind(socket_fd, reinterpret_cast<sockaddr*>(&address), sizeof address) != 0 ||
      ::chmod(socket_path.c_str(), 0666) != 0) {
    std::fprintf(stderr, "sandbox-init: bind %s: %s\n", socket_path.c_str(), std::strerror(errno));
    ::close(socket_fd);
    return -1;
  }
  int log_fd = ::open(log_path.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0644);
  if (log_fd < 0) {
    std::fprintf(stderr, "sandbox-init: open %s: %s\n", log_path.c_str(), std::strerror(errno));
    ::close(socket_fd);
    return -1;
  }
  pid_t pid = ::fork();
  if (pid == 0) {
    (void)::prctl(PR_SET_NAME, "tavow3-syslog");  // tells it from PID 1 in ps
    ::signal(SIGINT, SIG_IGN);
    ::signal(SIGTERM, SIG_IGN);
    ::signal(SIGHUP, SIG_IGN);
    RunSink(socket_fd, log_fd);
  }
  if (pid < 0) std::perror("sandbox-init: fork");
  ::close(socket_fd);
  ::close(log_fd);
  return pid;
}

}  // namespace tavow3::sandbox
