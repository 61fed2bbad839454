// Validator::CheckSCConflict: requested ports against the firewall service files.
#include <tavo/service_conf.h>
#include <tavo/tlib_file.h>
#include <tavow3/validator.h>

#include <string>
#include <vector>

#include "base/log.h"

namespace tavow3 {
namespace {

constexpr char kLogTag[] = "validator";

// The service files whose ports are taken: the library's own, then the
// hosting package's.
constexpr const char* kServiceFiles[] = {
    "/usr/tavo/etc/services.d/tavow3.sc",
    "/usr/local/etc/services.d/Pagora.sc",
};

// The most conflicting ports one test reports.
constexpr int kMaxConflicts = 12;

// Appends every port entry of the service file `path`, each followed by ",".
// A missing or unreadable file adds nothing.
void AppendClaimedPorts(const char* path, std::string* claimed) {
  if (TLIBCFileExist(path) == 0) return;
  TAVO_SERVICE_CONF* conf = nullptr;
  if (TAVOServiceConfGet(path, &conf) != 0) return;
  for (int i = 0; i < conf->port_count; ++i) {
    *claimed += conf->ports[i];
    *claimed += ',';
  }
  TAVOServiceConfFree(conf);
}

// A zero-terminated writable copy, as the platform's list parser takes.
std::vector<char> WritableCopy(const std::string& text) {
  std::vector<char> buffer(text.begin(), text.end());
  buffer.push_back('\0');
  return buffer;
}

}  // namespace

bool Validator::CheckSCConflict(std::set<unsigned short>& ports) {
  std::string candidates;
  for (unsigned short port : ports) candidates += std::to_string(port) + ",";
  std::string claimed;
  for (const char* path : kServiceFiles) AppendClaimedPorts(path, &claimed);

  std::vector<char> claimed_buffer = WritableCopy(claimed);
  std::vector<char> candidate_buffer = WritableCopy(candidates);
  TAVO_SERVICE_PORTS* conflicts = nullptr;
  const bool ok = TLIBIsPortConflict(claimed_buffer.data(), candidate_buffer.data(), "tcp",
                                     kMaxConflicts, &conflicts) == 0;
  for (TAVO_SERVICE_PORTS* entry = conflicts; entry != nullptr; entry = entry->next) {
    TAVOW3_LOG_ERR_AT(143, "Port %d conflict!", entry->port);
  }
  TAVOServiceConfPortsFree(conflicts);
  return ok;
}

bool Validator::CheckSCConflict(unsigned short port) {
  std::set<unsigned short> ports{port};
  return CheckSCConflict(ports);
}

}  // namespace tavow3
