// The subcommands of tavo-platform. Each takes the arguments after its name,
// prints its result on standard output and returns the program's exit status
// (kSuccess ... kFailed); errors go to standard error.
#ifndef TOOLS_TAVO_PLATFORM_COMMANDS_H_
#define TOOLS_TAVO_PLATFORM_COMMANDS_H_

#include <string>
#include <vector>

namespace tavo_platform {

using Args = std::vector<std::string>;

enum ExitStatus {
  kSuccess = 0,    // the call succeeded; for a question, the answer is yes
  kNo = 1,         // the answer is no, or the program run exited non-zero
  kBadUsage = 2,   // bad arguments
  kFailed = 3,     // the platform call failed
};

int Exec(const Args& args);
int Popen(const Args& args);
int FirewallStatus(const Args& args);
int FirewallLoad(const Args& args);
int FirewallUnload(const Args& args);
int TlsList(const Args& args);
int TlsLevel(const Args& args);
int ServiceConfRead(const Args& args);
int PortConflict(const Args& args);
int ServiceStatus(const Args& args);

// Prints "tavo-platform: <message>" on standard error and returns kBadUsage.
int UsageError(const std::string& message);

// Parses a whole unsigned decimal integer up to `max`; false for anything else.
bool ParseCount(const std::string& text, int max, int* value);

// Prints "tavo-platform: <what>: <errno text>" on standard error and returns kFailed.
int CallFailed(const std::string& what);

}  // namespace tavo_platform

#endif  // TOOLS_TAVO_PLATFORM_COMMANDS_H_
