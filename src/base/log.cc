#include "base/log.h"

#include <cerrno>
#include <cstdarg>
#include <cstdio>

#include "base/fault.h"

namespace tavow3::base {

void Log(int priority, const char* tag, int line, const char* format, ...) {
  const int saved_errno = errno;  // %m and the caller both want the original errno
  char message[2048];
  int prefix = std::snprintf(message, sizeof message, "%s:%d ", tag, line);
  if (prefix < 0) prefix = 0;
  if (static_cast<size_t>(prefix) >= sizeof message) prefix = sizeof message - 1;
  va_list args;
  va_start(args, format);
  errno = saved_errno;
  std::vsnprintf(message + prefix, sizeof message - prefix, format, args);
  va_end(args);
  if (!fault::Fire(fault::Op::kSyslog)) ::syslog(priority, "%s", message);
  errno = saved_errno;
}

}  // namespace tavow3::base
