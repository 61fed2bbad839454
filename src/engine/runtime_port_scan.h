// Which TCP ports processes other than the running web server use, read from
// /proc. Every function re-reads the tables: nothing is cached.
#ifndef TAVOW3_SRC_ENGINE_RUNTIME_PORT_SCAN_H_
#define TAVOW3_SRC_ENGINE_RUNTIME_PORT_SCAN_H_

#include <string>
#include <vector>

#include "base/export.h"

namespace tavow3 {

// True for the connection states in which a socket holds its local port:
// 1 established, 2 SYN sent, 3 SYN received, 10 listening.
TAVOW3_INTERNAL bool IsPortHoldingState(unsigned int state);

// The web-server master's process id from "/run/nginx.pid", or -1 when the
// file is missing, unreadable, holds no number or a negative one.
TAVOW3_INTERNAL int ReadWebServerPid();

// The socket inode in a descriptor link target ("socket:[123]", or the older
// "[0000]:123"); false for any other target or a zero or unparsable number.
TAVOW3_INTERNAL bool SocketInodeOfLink(const std::string& target, unsigned long long* inode);

// The inode numbers of the sockets that process `pid` holds open, ascending
// and unique. Empty when its descriptors cannot be listed; unreadable links
// are skipped.
TAVOW3_INTERNAL std::vector<unsigned long long> ProcessSocketInodes(int pid);

// The local ports of "/proc/net/tcp" and "/proc/net/tcp6" in a holding state
// that some socket outside the web-server master holds and none of the
// master's sockets holds; ascending. Without the pid file every such port
// counts. Thread-safe.
TAVOW3_INTERNAL std::vector<unsigned short> CollectForeignTCPPorts();

}  // namespace tavow3

#endif  // TAVOW3_SRC_ENGINE_RUNTIME_PORT_SCAN_H_
