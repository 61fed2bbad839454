// Argument and error helpers shared by the subcommands.
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "commands.h"

namespace tavo_platform {

int UsageError(const std::string& message) {
  std::fprintf(stderr, "tavo-platform: %s (see tavo-platform help)\n", message.c_str());
  return kBadUsage;
}

int CallFailed(const std::string& what) {
  std::fprintf(stderr, "tavo-platform: %s: %s\n", what.c_str(), std::strerror(errno));
  return kFailed;
}

bool ParseCount(const std::string& text, int max, int* value) {
  if (text.empty() || text.size() > 9) return false;
  for (char c : text) {
    if (c < '0' || c > '9') return false;
  }
  long parsed = std::strtol(text.c_str(), nullptr, 10);
  if (parsed > max) return false;
  *value = static_cast<int>(parsed);
  return true;
}

}  // namespace tavo_platform
