// The sandbox's /dev/log: a datagram socket whose messages a sink process
// appends, one per line, to a file.
#ifndef TAVOW3_TOOLS_SANDBOX_INIT_SYSLOG_SINK_H_
#define TAVOW3_TOOLS_SANDBOX_INIT_SYSLOG_SINK_H_

#include <sys/types.h>

#include <string>

namespace tavow3::sandbox {

// Binds a datagram socket at `socket_path` (mode 0666), then forks a sink that
// appends every message received to `log_path` as it arrived ("<PRI>Mmm dd
// hh:mm:ss tag: text"), with "\" written as "\\" and a newline as "\n" so that
// each message is one line. The socket is bound before this returns, so
// messages sent afterwards are never lost. Returns the sink's pid, or -1 with
// a message on stderr.
pid_t StartSyslogSink(const std::string& socket_path, const std::string& log_path);

}  // namespace tavow3::sandbox

#endif  // TAVOW3_TOOLS_SANDBOX_INIT_SYSLOG_SINK_H_
