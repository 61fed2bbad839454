// The library's one logging facility: a syslog line "<tag>:<line> <message>".
// Each .cc that logs defines `constexpr char kLogTag[]`, its source tag, once.
#ifndef TAVOW3_SRC_BASE_LOG_H_
#define TAVOW3_SRC_BASE_LOG_H_

#include <syslog.h>

#include "base/export.h"

namespace tavow3::base {

// Sends "<tag>:<line> " followed by the printf-formatted message to syslog
// at `priority` (%m is the text of errno). Never fails; thread-safe.
TAVOW3_INTERNAL void Log(int priority, const char* tag, int line, const char* format, ...)
    __attribute__((format(printf, 4, 5)));

}  // namespace tavow3::base

// Logs at error level with the real line number.
#define TAVOW3_LOG_ERR(...) ::tavow3::base::Log(LOG_ERR, kLogTag, __LINE__, __VA_ARGS__)
// Logs at error level with a line number that the interface fixes.
#define TAVOW3_LOG_ERR_AT(line, ...) ::tavow3::base::Log(LOG_ERR, kLogTag, (line), __VA_ARGS__)

#endif  // TAVOW3_SRC_BASE_LOG_H_
