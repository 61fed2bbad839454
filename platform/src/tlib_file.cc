#include "tavo/tlib_file.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <string>
#include <string_view>

#include "file_util.h"

namespace {

using tavo::internal::Open;
using tavo::internal::ReadFile;
using tavo::internal::UniqueFd;

constexpr std::string_view kBlanks = " \t\r";

std::string_view Trim(std::string_view text) {
  std::string_view::size_type begin = text.find_first_not_of(kBlanks);
  if (begin == std::string_view::npos) return {};
  std::string_view::size_type end = text.find_last_not_of(kBlanks);
  return text.substr(begin, end - begin + 1);
}

// The value of a shell-style assignment: one pair of matching quotes around
// it is removed.
std::string_view Unquote(std::string_view value) {
  if (value.size() >= 2 && (value.front() == '"' || value.front() == '\'') &&
      value.back() == value.front()) {
    return value.substr(1, value.size() - 2);
  }
  return value;
}

bool SetTimesToNow(const char* path) {
  int rc;
  do {
    rc = ::utimensat(AT_FDCWD, path, nullptr, 0);
  } while (rc != 0 && errno == EINTR);
  return rc == 0;
}

}  // namespace

int TLIBCFileExist(const char* path) {
  struct stat st;
  return path != nullptr && ::stat(path, &st) == 0 ? 1 : 0;
}

int TLIBCFileTouch(const char* path) {
  if (path == nullptr || path[0] == '\0') {
    errno = EINVAL;
    return -1;
  }
  if (SetTimesToNow(path)) return 0;
  if (errno != ENOENT) return -1;
  UniqueFd fd = Open(path, O_WRONLY | O_CREAT | O_EXCL | O_NOCTTY, 0644);
  if (!fd.valid()) {
    // Another process created it in between: it exists, so touch it.
    return errno == EEXIST && SetTimesToNow(path) ? 0 : -1;
  }
  // The mode is exact whatever the caller's umask.
  if (::fchmod(fd.get(), 0644) != 0) return -1;
  return fd.Close() ? 0 : -1;
}

int TLIBCFileCheckKeyValue(const char* path, const char* key, const char* value) {
  if (path == nullptr || key == nullptr || value == nullptr) {
    errno = EINVAL;
    return -1;
  }
  std::string text;
  if (!ReadFile(path, &text)) return -1;
  std::string_view wanted_key(key);
  bool found = false;
  std::string_view found_value;
  std::string_view rest(text);
  while (!rest.empty()) {
    std::string_view::size_type newline = rest.find('\n');
    std::string_view line = Trim(rest.substr(0, newline));
    rest = newline == std::string_view::npos ? std::string_view() : rest.substr(newline + 1);
    if (line.empty() || line.front() == '#') continue;
    std::string_view::size_type equals = line.find('=');
    if (equals == std::string_view::npos || line.substr(0, equals) != wanted_key) continue;
    found = true;
    found_value = Unquote(line.substr(equals + 1));
  }
  return found && found_value == value ? 1 : 0;
}
