#include "port_owners.h"

#include <cstdlib>
#include <fstream>
#include <unordered_map>

#include "base/file_io.h"
#include "engine/runtime_port_scan.h"
#include "engine/tcp_table.h"

namespace tavow3::tools {
namespace {

// Socket inode -> the processes that hold it, over every process in /proc.
std::unordered_map<unsigned long long, std::vector<pid_t>> SocketHolders() {
  std::unordered_map<unsigned long long, std::vector<pid_t>> holders;
  std::vector<std::string> names;
  if (!base::ListDir("/proc", &names)) return holders;
  for (const std::string& name : names) {
    char* end = nullptr;
    const long pid = std::strtol(name.c_str(), &end, 10);
    if (*end != '\0' || pid <= 0) continue;
    for (unsigned long long inode : ProcessSocketInodes(static_cast<int>(pid))) {
      holders[inode].push_back(static_cast<pid_t>(pid));
    }
  }
  return holders;
}

}  // namespace

std::map<unsigned short, std::vector<PortSocket>> ReadPortSockets() {
  const auto holders = SocketHolders();
  std::map<unsigned short, std::vector<PortSocket>> ports;
  for (const char* table : {"tcp", "tcp6"}) {
    TcpTableReader reader(std::string("/proc/net/") + table);
    TcpTableLine line;
    while (reader.Next(&line)) {
      if (!IsPortHoldingState(line.state)) continue;
      PortSocket socket;
      socket.state = line.state;
      socket.table = table;
      const auto found = holders.find(line.inode);
      if (found != holders.end()) socket.holders = found->second;
      ports[line.local_port].push_back(socket);
    }
  }
  return ports;
}

std::string ProcessName(pid_t pid) {
  std::ifstream comm("/proc/" + std::to_string(pid) + "/comm");
  std::string name;
  return std::getline(comm, name) ? name : "?";
}

const char* StateName(unsigned state) {
  switch (state) {
    case 1:
      return "ESTABLISHED";
    case 2:
      return "SYN_SENT";
    case 3:
      return "SYN_RECV";
    case 10:
      return "LISTEN";
    default:
      return "OTHER";
  }
}

}  // namespace tavow3::tools
