// The relay service's trusted-proxy list: set, clear and list.
#include <tavow3/vantoro_proxy_operators.h>

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>

#include <cerrno>
#include <sstream>
#include <utility>

#include <tavo/tavofs.h>
#include <tavo/tlib_file.h>

#include "base/file_io.h"
#include "base/log.h"
#include "base/unique_fd.h"

namespace {

namespace base = tavow3::base;

constexpr char kLogTag[] = "nginx_deploy";
constexpr char kListDir[] = "/var/tmp/nginx/trusted_proxy";
constexpr char kListFile[] = "/var/tmp/nginx/trusted_proxy/vantoro.conf";
constexpr char kTempTemplate[] = "/var/tmp/nginx/trusted_proxy/vantoro.conf.XXXXXX";
constexpr char kDirective[] = "set_real_ip_from";

bool IsPlainAddress(const std::string& text) {
  in_addr v4;
  in6_addr v6;
  return inet_pton(AF_INET, text.c_str(), &v4) == 1 || inet_pton(AF_INET6, text.c_str(), &v6) == 1;
}

std::string ListText(const std::vector<std::string>& addresses) {
  std::string text;
  for (const std::string& address : addresses) text += std::string(kDirective) + " " + address + ";\n";
  return text;
}

// Fills the temporary file `temp` with `text`, owned by root, mode 0644.
// False, logged, on any failure.
bool FillTemp(const std::string& temp, const std::string& text) {
  base::UniqueFd fd = base::Open(temp, O_WRONLY | O_TRUNC);
  if (!fd) {
    TAVOW3_LOG_ERR_AT(1093, "Fail to fopen file (%s, %m)", temp.c_str());
    return false;
  }
  // A short list must never go live: the write is checked although the
  // list's format leaves no message for it.
  if (!base::WriteAll(fd.get(), text) || !base::Fsync(fd.get())) {
    TAVOW3_LOG_ERR("Fail to write file (%s, %m)", temp.c_str());
    return false;
  }
  if (!base::Fchown(fd.get(), 0, 0)) {
    TAVOW3_LOG_ERR_AT(1101, "Fail to chown file (%s, %m)", temp.c_str());
    return false;
  }
  if (!base::Fchmod(fd.get(), 0644)) {
    TAVOW3_LOG_ERR_AT(1106, "Fail to chmod file (%s, %m)", temp.c_str());
    return false;
  }
  if (!fd.Reset()) {
    TAVOW3_LOG_ERR("Fail to write file (%s, %m)", temp.c_str());
    return false;
  }
  return true;
}

// Writes the list to a new temporary file and renames it over the live one.
// The temporary is always removed afterwards.
int ReplaceList(const std::vector<std::string>& addresses, std::string* msg) {
  // When mkstemp fails, the removal at the end still runs, on the pattern's
  // own name: on a file system that refuses the creation it says why once more.
  std::string temp = kTempTemplate;
  bool made;
  {
    // The file is filled through a descriptor of its own, opened by name.
    const base::UniqueFd fd = base::MakeTemp(kTempTemplate, &temp);
    made = fd.valid();
    if (!made) TAVOW3_LOG_ERR_AT(1088, "Fail to create temp file (%s, %m)", kTempTemplate);
  }
  int result = -1;
  if (made && FillTemp(temp, ListText(addresses))) {
    if (base::Rename(temp, kListFile)) {
      *msg += "List of Vantoro servers is set.\n";
      result = 0;
    } else {
      TAVOW3_LOG_ERR_AT(1111, "Fail to rename file from %s to %s, %m", temp.c_str(), kListFile);
    }
  }
  if (!base::Unlink(temp) && errno != ENOENT) {
    TAVOW3_LOG_ERR_AT(1120, "Fail to remove temp file %s, %m", temp.c_str());
  }
  return result;
}

}  // namespace

bool NginxConfOperatorSetVantoroProxy::set_args(std::vector<std::string> args) {
  for (const std::string& arg : args) {
    if (!IsPlainAddress(arg)) {
      msg_ += arg + " is an invalid IP\n";
      return false;
    }
  }
  addresses_ = std::move(args);
  return true;
}

int NginxConfOperatorSetVantoroProxy::run() {
  if (addresses_.empty()) {
    if (!base::Unlink(kListFile) && errno != ENOENT) {
      TAVOW3_LOG_ERR_AT(1071, "Cannot delete %s %m", kListFile);
      return -1;
    }
    msg_ += "List of Vantoro servers is empty.\nClear the trust list.\n";
    return 0;
  }
  if (TAVOFSMkdirP(kListDir, 0, 0755) == -1) {
    TAVOW3_LOG_ERR_AT(1060, "TAVOFSMkdirP failed (%s, %m)", kListDir);
    return -1;
  }
  return ReplaceList(addresses_, &msg_);
}

int NginxConfOperatorClearVantoroProxy::run() {
  if (!base::Unlink(kListFile) && errno != ENOENT) {
    TAVOW3_LOG_ERR_AT(1146, "Cannot delete link %s %m", kListFile);
    return -1;
  }
  msg_ += "Trust list of Vantoro servers is cleared.\n";
  return 0;
}

int NginxConfOperatorListVantoroProxy::run() {
  if (TLIBCFileExist(kListFile) != 1) return 0;
  const base::UniqueFd fd = base::Open(kListFile, O_RDONLY);
  if (!fd) {
    TAVOW3_LOG_ERR_AT(1163, "Failed to open %s %m", kListFile);
    return -1;
  }
  std::string text;
  if (!base::ReadAll(fd.get(), &text)) {
    TAVOW3_LOG_ERR("Failed to read %s %m", kListFile);
    return -1;
  }
  // The word after each directive, without its last character (the ";").
  std::istringstream words(text);
  std::string previous;
  for (std::string word; words >> word; previous = word) {
    if (previous == kDirective) msg_ += word.substr(0, word.size() - 1) + "\n";
  }
  return 0;
}
