// Real loopback TCP sockets for the port-scan tests, and a stand-in for the
// web-server master: a child process that holds its own sockets.
#ifndef TAVOW3_TESTS_ENGINE_SOCKETS_H_
#define TAVOW3_TESTS_ENGINE_SOCKETS_H_

#include <sys/types.h>

#include <string>
#include <vector>

#include "base/unique_fd.h"

namespace tavow3::test {

enum SocketFlags {
  kNoFlags = 0,
  kV6Only = 1,     // IPv6 socket that takes no IPv4 traffic
  kReusePort = 2,  // SO_REUSEPORT: several listeners may share the port
};

// A socket with its local port.
struct BoundSocket {
  base::UniqueFd fd;
  unsigned short port = 0;
};

// Listens on the loopback address of `family` (AF_INET or AF_INET6) at `port`
// (0: the kernel picks one). Fails the test when that is impossible.
BoundSocket Listen(int family, unsigned short port, int flags = kNoFlags);

// Both ends of an established loopback connection to `listener`.
struct Connection {
  BoundSocket client;  // its port is the client's local (ephemeral) port
  BoundSocket server;  // the accepted socket; its local port is the listener's
};
Connection Connect(int family, const BoundSocket& listener);

// The states (1 established, 6 TIME_WAIT, 8 CLOSE_WAIT, 10 listening ...) of
// every socket whose local port is `port`, from /proc/net/tcp and tcp6, read
// independently of the library.
std::vector<unsigned> LocalPortStates(unsigned short port);

// Waits until some socket with local port `port` is in `state`.
void WaitForState(unsigned short port, unsigned state);

// What the web-server stand-in holds.
struct SocketSpec {
  int family;
  int flags;
  unsigned short port;  // 0: any
  bool established;     // a connection (both ends held) instead of a listener
};

// A child process holding the sockets of `specs`, created after the fork and
// closed with the process; the constructor returns when they all exist. The
// child holds none of its parent's descriptors.
class SocketHolder {
 public:
  explicit SocketHolder(const std::vector<SocketSpec>& specs);
  ~SocketHolder();
  SocketHolder(const SocketHolder&) = delete;
  SocketHolder& operator=(const SocketHolder&) = delete;

  pid_t pid() const { return pid_; }
  // The local port of each spec, in order (a connection's listener port).
  const std::vector<unsigned short>& ports() const { return ports_; }

 private:
  pid_t pid_ = -1;
  base::UniqueFd control_;  // closing it tells the child to exit
  std::vector<unsigned short> ports_;
};

// Replaces `path` with `bytes` (creating its directory).
void WriteTestFile(const std::string& path, const std::string& bytes);

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_ENGINE_SOCKETS_H_
