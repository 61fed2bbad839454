#include "engine/runtime_port_scan.h"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdlib>

#include <tavow3/engine.h>

#include "base/file_io.h"
#include "base/log.h"
#include "engine/tcp_table.h"

namespace tavow3 {
namespace {

constexpr char kLogTag[] = "engine";
constexpr char kWebServerPidFile[] = "/run/nginx.pid";
// Written by the web server's start-up: 1 or 2 means it serves port 443 itself.
constexpr char kPort443Owner[] = "/run/ngx_port_443";
constexpr const char* kTcpTables[] = {"/proc/net/tcp", "/proc/net/tcp6"};
constexpr char kSocketLinkPrefix[] = "socket:[";
constexpr char kOldSocketLinkPrefix[] = "[0000]:";

enum TcpState : unsigned int {
  kEstablished = 1,
  kSynSent = 2,
  kSynReceived = 3,
  kListening = 10,
};

// One bit per TCP port.
class PortBits {
 public:
  void Set(unsigned short port) { words_[port >> 6] |= uint64_t{1} << (port & 63); }
  void Subtract(const PortBits& other) {
    for (size_t i = 0; i < kWords; ++i) words_[i] &= ~other.words_[i];
  }
  std::vector<unsigned short> ToVector() const {
    std::vector<unsigned short> ports;
    for (size_t i = 0; i < kWords; ++i) {
      for (uint64_t word = words_[i]; word != 0; word &= word - 1) {
        ports.push_back(static_cast<unsigned short>(i * 64 + __builtin_ctzll(word)));
      }
    }
    return ports;
  }

 private:
  static constexpr size_t kWords = 65536 / 64;
  uint64_t words_[kWords] = {};
};

// The first integer of the file as fscanf("%d") reads it: false when the file
// cannot be read or does not start with a number.
bool ReadIntegerFile(const char* path, int* value) {
  std::string text;
  if (!base::ReadFile(path, &text)) return false;
  char* end = nullptr;
  const long number = std::strtol(text.c_str(), &end, 10);
  if (end == text.c_str()) return false;
  *value = static_cast<int>(number);  // scanf's %d keeps the low bits too
  return true;
}

bool StartsWith(const std::string& text, const char* prefix, size_t length) {
  return text.compare(0, length, prefix) == 0;
}

}  // namespace

bool IsPortHoldingState(unsigned int state) {
  return state == kEstablished || state == kSynSent || state == kSynReceived ||
         state == kListening;
}

int ReadWebServerPid() {
  int pid = -1;
  if (!ReadIntegerFile(kWebServerPidFile, &pid) || pid < 0) return -1;
  return pid;
}

bool SocketInodeOfLink(const std::string& target, unsigned long long* inode) {
  constexpr size_t kSocketLength = sizeof(kSocketLinkPrefix) - 1;
  constexpr size_t kOldSocketLength = sizeof(kOldSocketLinkPrefix) - 1;
  char* end = nullptr;
  long number = 0;
  errno = 0;
  if (StartsWith(target, kSocketLinkPrefix, kSocketLength)) {
    number = std::strtol(target.c_str() + kSocketLength, &end, 0);
    if (*end != ']') return false;
  } else if (StartsWith(target, kOldSocketLinkPrefix, kOldSocketLength)) {
    number = std::strtol(target.c_str() + kOldSocketLength, &end, 0);
    if (*end != '\0') return false;
  } else {
    return false;
  }
  if (errno != 0 || number == 0) return false;
  *inode = static_cast<unsigned long long>(number);
  return true;
}

std::vector<unsigned long long> ProcessSocketInodes(int pid) {
  std::vector<unsigned long long> inodes;
  std::vector<std::string> links;
  if (!base::Glob("/proc/" + std::to_string(pid) + "/fd/*", &links)) return inodes;
  std::string target;
  for (const std::string& link : links) {
    unsigned long long inode = 0;
    if (base::Readlink(link, &target) && SocketInodeOfLink(target, &inode)) {
      inodes.push_back(inode);
    }
  }
  std::sort(inodes.begin(), inodes.end());
  inodes.erase(std::unique(inodes.begin(), inodes.end()), inodes.end());
  return inodes;
}

std::vector<unsigned short> CollectForeignTCPPorts() {
  const int pid = ReadWebServerPid();
  const std::vector<unsigned long long> web_inodes =
      pid >= 0 ? ProcessSocketInodes(pid) : std::vector<unsigned long long>();
  PortBits web_ports;
  PortBits foreign_ports;
  for (const char* path : kTcpTables) {
    TcpTableReader table(path);
    TcpTableLine line;
    while (table.Next(&line)) {
      if (!IsPortHoldingState(line.state)) continue;
      const bool is_web = std::binary_search(web_inodes.begin(), web_inodes.end(), line.inode);
      (is_web ? web_ports : foreign_ports).Set(line.local_port);
    }
  }
  // A port that the web server holds stays usable even when another process
  // shares it.
  foreign_ports.Subtract(web_ports);
  return foreign_ports.ToVector();
}

bool Engine::IsRuntimeTCPPortConflict(unsigned short port) {
  int owner = 0;
  if (port == 443 && ReadIntegerFile(kPort443Owner, &owner) && (owner == 1 || owner == 2)) {
    return false;
  }
  const std::vector<unsigned short> foreign = CollectForeignTCPPorts();
  if (!std::binary_search(foreign.begin(), foreign.end(), port)) return false;
  TAVOW3_LOG_ERR_AT(317, "Runtime port %d conflict for nginx", port);
  return true;
}

}  // namespace tavow3
