// Which processes hold the sockets on a TCP port, from /proc.
#ifndef TAVOW3_TOOLS_ENGINE_INFO_PORT_OWNERS_H_
#define TAVOW3_TOOLS_ENGINE_INFO_PORT_OWNERS_H_

#include <sys/types.h>

#include <map>
#include <string>
#include <vector>

namespace tavow3::tools {

// One socket on a port in a state that holds it.
struct PortSocket {
  unsigned state = 0;           // 1 established, 2 SYN sent, 3 SYN received, 10 listening
  std::string table;            // "tcp" or "tcp6"
  std::vector<pid_t> holders;   // processes with a descriptor on it (may be empty)
};

// The sockets of every port in a holding state, read from /proc/net/tcp{,6},
// with the processes (from /proc/*/fd) that hold each.
std::map<unsigned short, std::vector<PortSocket>> ReadPortSockets();

// "name" of a process from /proc/<pid>/comm, "?" when it is gone.
std::string ProcessName(pid_t pid);

// "LISTEN", "ESTABLISHED" ... for a table state.
const char* StateName(unsigned state);

}  // namespace tavow3::tools

#endif  // TAVOW3_TOOLS_ENGINE_INFO_PORT_OWNERS_H_
