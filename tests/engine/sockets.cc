#include "sockets.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <stdexcept>
#include <thread>

namespace tavow3::test {
namespace {

// Helpers throw on failure; GoogleTest reports the exception as a failure.
void Check(bool ok, const std::string& what) {
  if (!ok) throw std::runtime_error(what + ": " + std::strerror(errno));
}

socklen_t LoopbackAddress(int family, unsigned short port, sockaddr_storage* address) {
  std::memset(address, 0, sizeof *address);
  if (family == AF_INET) {
    auto* in = reinterpret_cast<sockaddr_in*>(address);
    in->sin_family = AF_INET;
    in->sin_port = htons(port);
    in->sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return sizeof *in;
  }
  auto* in6 = reinterpret_cast<sockaddr_in6*>(address);
  in6->sin6_family = AF_INET6;
  in6->sin6_port = htons(port);
  in6->sin6_addr = in6addr_loopback;
  return sizeof *in6;
}

unsigned short LocalPort(int fd) {
  sockaddr_storage address;
  socklen_t length = sizeof address;
  Check(getsockname(fd, reinterpret_cast<sockaddr*>(&address), &length) == 0, "getsockname");
  return ntohs(address.ss_family == AF_INET
                   ? reinterpret_cast<sockaddr_in*>(&address)->sin_port
                   : reinterpret_cast<sockaddr_in6*>(&address)->sin6_port);
}

void SetOption(int fd, int level, int name) {
  const int on = 1;
  Check(setsockopt(fd, level, name, &on, sizeof on) == 0, "setsockopt");
}

void WriteAllOrThrow(int fd, const void* data, size_t size) {
  const char* p = static_cast<const char*>(data);
  while (size > 0) {
    const ssize_t count = write(fd, p, size);
    if (count < 0 && errno == EINTR) continue;
    Check(count > 0, "write");
    p += count;
    size -= static_cast<size_t>(count);
  }
}

bool ReadAllOrEof(int fd, void* data, size_t size) {
  char* p = static_cast<char*>(data);
  while (size > 0) {
    const ssize_t count = read(fd, p, size);
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return false;
    p += count;
    size -= static_cast<size_t>(count);
  }
  return true;
}

// The child's side of SocketHolder: make the sockets, report their ports,
// hold them until the parent closes the control pipe.
[[noreturn]] void HoldSockets(const std::vector<SocketSpec>& specs, int report, int control) {
  std::vector<BoundSocket> held;
  std::vector<unsigned short> ports;
  try {
    for (const SocketSpec& spec : specs) {
      BoundSocket listener = Listen(spec.family, spec.port, spec.flags);
      ports.push_back(listener.port);
      if (spec.established) {
        Connection connection = Connect(spec.family, listener);
        held.push_back(std::move(connection.client));
        held.push_back(std::move(connection.server));
      }
      held.push_back(std::move(listener));
    }
    const uint32_t count = static_cast<uint32_t>(ports.size());
    WriteAllOrThrow(report, &count, sizeof count);
    WriteAllOrThrow(report, ports.data(), ports.size() * sizeof ports[0]);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "socket holder: %s\n", error.what());
    _exit(1);
  }
  for (;;) {
    char byte;
    const ssize_t count = read(control, &byte, 1);
    if (count == 0 || (count < 0 && errno != EINTR)) break;
  }
  _exit(0);
}

}  // namespace

BoundSocket Listen(int family, unsigned short port, int flags) {
  BoundSocket result;
  result.fd = base::UniqueFd(socket(family, SOCK_STREAM | SOCK_CLOEXEC, 0));
  Check(result.fd.valid(), "socket");
  SetOption(result.fd.get(), SOL_SOCKET, SO_REUSEADDR);
  if (flags & kReusePort) SetOption(result.fd.get(), SOL_SOCKET, SO_REUSEPORT);
  if (flags & kV6Only) SetOption(result.fd.get(), IPPROTO_IPV6, IPV6_V6ONLY);
  sockaddr_storage address;
  const socklen_t length = LoopbackAddress(family, port, &address);
  Check(bind(result.fd.get(), reinterpret_cast<sockaddr*>(&address), length) == 0,
        "bind port " + std::to_string(port));
  Check(listen(result.fd.get(), 64) == 0, "listen");
  result.port = LocalPort(result.fd.get());
  return result;
}

Connection Connect(int family, const BoundSocket& listener) {
  Connection connection;
  connection.client.fd = base::UniqueFd(socket(family, SOCK_STREAM | SOCK_CLOEXEC, 0));
  Check(connection.client.fd.valid(), "socket");
  sockaddr_storage address;
  const socklen_t length = LoopbackAddress(family, listener.port, &address);
  Check(connect(connection.client.fd.get(), reinterpret_cast<sockaddr*>(&address), length) == 0,
        "connect");
  connection.client.port = LocalPort(connection.client.fd.get());
  connection.server.fd = base::UniqueFd(accept4(listener.fd.get(), nullptr, nullptr, SOCK_CLOEXEC));
  Check(connection.server.fd.valid(), "accept");
  connection.server.port = LocalPort(connection.server.fd.get());
  return connection;
}

std::vector<unsigned> LocalPortStates(unsigned short port) {
  std::vector<unsigned> states;
  for (const char* path : {"/proc/net/tcp", "/proc/net/tcp6"}) {
    std::ifstream table(path);
    std::string line;
    std::getline(table, line);  // header
    while (std::getline(table, line)) {
      // "  sl  local_address rem_address   st ..."
      char local[80];
      unsigned local_port;
      char remote[80];
      unsigned state;
      if (std::sscanf(line.c_str(), " %*u: %79[^:]:%x %79s %x", local, &local_port, remote,
                      &state) == 4 &&
          local_port == port) {
        states.push_back(state);
      }
    }
  }
  return states;
}

void WaitForState(unsigned short port, unsigned state) {
  for (;;) {
    for (unsigned found : LocalPortStates(port)) {
      if (found == state) return;
    }
    std::this_thread::sleep_for(std::chrono::milliseconds(2));
  }
}

SocketHolder::SocketHolder(const std::vector<SocketSpec>& specs) {
  int report[2];
  int control[2];
  Check(pipe2(report, O_CLOEXEC) == 0 && pipe2(control, O_CLOEXEC) == 0, "pipe");
  const pid_t parent = getpid();
  pid_ = fork();
  Check(pid_ >= 0, "fork");
  if (pid_ == 0) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (getppid() != parent) _exit(1);
    // Keep only the two pipe ends this side uses: an inherited socket would
    // count as the web server's.
    const unsigned low = static_cast<unsigned>(std::min(report[1], control[0]));
    const unsigned high = static_cast<unsigned>(std::max(report[1], control[0]));
    close_range(3, low - 1, 0);
    close_range(low + 1, high - 1, 0);
    close_range(high + 1, ~0U, 0);
    HoldSockets(specs, report[1], control[0]);
  }
  close(report[1]);
  close(control[0]);
  control_ = base::UniqueFd(control[1]);
  base::UniqueFd report_read(report[0]);
  uint32_t count = 0;
  Check(ReadAllOrEof(report_read.get(), &count, sizeof count), "socket holder failed");
  ports_.resize(count);
  Check(ReadAllOrEof(report_read.get(), ports_.data(), count * sizeof ports_[0]),
        "socket holder ports");
}

SocketHolder::~SocketHolder() {
  if (pid_ <= 0) return;
  (void)control_.Reset();
  int status;
  while (waitpid(pid_, &status, 0) < 0 && errno == EINTR) {
  }
}

void WriteTestFile(const std::string& path, const std::string& bytes) {
  const std::string dir = path.substr(0, path.rfind('/'));
  for (size_t slash = dir.find('/', 1); slash != std::string::npos;
       slash = dir.find('/', slash + 1)) {
    (void)mkdir(dir.substr(0, slash).c_str(), 0755);
  }
  (void)mkdir(dir.c_str(), 0755);
  const std::string temp = path + ".tmp";
  {
    std::ofstream out(temp, std::ios::binary | std::ios::trunc);
    out << bytes;
    Check(static_cast<bool>(out.flush()), "write " + temp);
  }
  Check(rename(temp.c_str(), path.c_str()) == 0, "rename " + path);
}

}  // namespace tavow3::test
