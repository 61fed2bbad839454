#include "tavo/tlib_service.h"

#include <signal.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <string>
#include <string_view>

#include "file_util.h"
#include "spawn.h"

namespace {

using tavo::internal::ReadFile;
using tavo::internal::SpawnAndWait;
using tavo::internal::SpawnSpec;

constexpr char kScriptDir[] = "/usr/tavo/etc/rc.sysv/";
constexpr char kPidDir[] = "/run/";
constexpr char kFirewallTool[] = "/usr/tavo/bin/tavofirewall";

// A service name is one path component.
bool IsServiceName(const char* name) {
  return name != nullptr && name[0] != '\0' && std::strchr(name, '/') == nullptr &&
         std::strcmp(name, ".") != 0 && std::strcmp(name, "..") != 0;
}

// Parses the decimal process id at the start of a pid file; 0 when the file
// holds none.
pid_t ParsePid(std::string_view text) {
  std::string_view::size_type begin = text.find_first_not_of(" \t\r\n");
  if (begin == std::string_view::npos) return 0;
  long long pid = 0;
  std::string_view::size_type i = begin;
  for (; i < text.size() && text[i] >= '0' && text[i] <= '9'; ++i) {
    pid = pid * 10 + (text[i] - '0');
    if (pid > 0x7fffffff) return 0;
  }
  if (i == begin || (i < text.size() && std::strchr(" \t\r\n", text[i]) == nullptr)) return 0;
  return static_cast<pid_t>(pid);
}

// True when `pid` names a process that has not exited: a zombie, whose pid
// file was left behind by a dead daemon, does not count.
bool IsAlive(pid_t pid) {
  if (pid <= 0) return false;
  if (::kill(pid, 0) != 0 && errno != EPERM) return false;
  std::string stat;
  if (!ReadFile("/proc/" + std::to_string(pid) + "/stat", &stat)) return true;
  // The state follows the parenthesised command name, which may hold ')'.
  std::string::size_type paren = stat.rfind(')');
  if (paren == std::string::npos || paren + 2 >= stat.size()) return true;
  char state = stat[paren + 2];
  return state != 'Z' && state != 'X';
}

}  // namespace

int TLIBServiceReload(const char* name) {
  if (!IsServiceName(name)) {
    errno = EINVAL;
    return -1;
  }
  std::string script = std::string(kScriptDir) + name + ".sh";
  const char* argv[] = {script.c_str(), "reload", nullptr};
  SpawnSpec spec;
  spec.argv = argv;
  spec.null_stdin = true;
  return SpawnAndWait(spec);
}

int TLIBServicectlStatus(const char* name, int* pid, int* state) {
  if (!IsServiceName(name) || pid == nullptr || state == nullptr) {
    errno = EINVAL;
    return -1;
  }
  std::string text;
  if (!ReadFile(std::string(kPidDir) + name + ".pid", &text)) {
    if (errno != ENOENT) return -1;
    text.clear();
  }
  pid_t found = ParsePid(text);
  bool alive = IsAlive(found);
  *pid = alive ? found : 0;
  *state = alive ? TLIB_SERVICE_RUNNING : TLIB_SERVICE_STOPPED;
  return 0;
}

int TLIBServiceConfServNotify(const TLIB_SERVCONF_NOTIFY* notify) {
  if (notify == nullptr) {
    errno = EINVAL;
    return -1;
  }
  const char* argv[5] = {kFirewallTool, "--reload", nullptr, nullptr, nullptr};
  if (notify->old_file != nullptr && notify->new_file != nullptr) {
    argv[2] = notify->old_file;
    argv[3] = notify->new_file;
  }
  SpawnSpec spec;
  spec.argv = argv;
  spec.null_stdin = true;
  return SpawnAndWait(spec);
}
