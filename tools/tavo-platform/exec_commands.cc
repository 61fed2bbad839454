// exec and popen: running programs through the platform, by argument vector.
#include <tavo/tlib_exec.h>

#include <cstdio>
#include <string>
#include <vector>

#include "commands.h"

namespace tavo_platform {
namespace {

// Up to four arguments fit TLIBCExec; longer vectors go through TLIBCExecl.
constexpr size_t kExecArgs = 4;

std::vector<const char*> Vector(const Args& args) {
  std::vector<const char*> argv;
  for (const std::string& arg : args) argv.push_back(arg.c_str());
  argv.push_back(nullptr);
  return argv;
}

int Report(const char* call, const std::string& program, int status) {
  if (status < 0) {
    std::printf("%s: %s could not run or was killed by a signal\n", call, program.c_str());
    return kFailed;
  }
  std::printf("%s: %s exited with status %d\n", call, program.c_str(), status);
  return status == 0 ? kSuccess : kNo;
}

}  // namespace

int Exec(const Args& args) {
  if (args.empty()) return UsageError("exec needs a program");
  std::fflush(stdout);  // the program writes to the same output
  if (args.size() - 1 <= kExecArgs) {
    const char* arg[kExecArgs] = {};
    for (size_t i = 1; i < args.size(); ++i) arg[i - 1] = args[i].c_str();
    return Report("TLIBCExec", args[0], TLIBCExec(args[0].c_str(), arg[0], arg[1], arg[2], arg[3]));
  }
  std::vector<const char*> argv = Vector(args);
  return Report("TLIBCExecl", args[0], TLIBCExecl(argv.data(), TLIB_EXEC_WAIT | TLIB_EXEC_STATUS));
}

int Popen(const Args& args) {
  if (args.empty()) return UsageError("popen needs a program");
  std::vector<const char*> argv = Vector(args);
  FILE* stream = TLIBCPopen(argv.data(), "rB");
  if (stream == nullptr) return CallFailed("TLIBCPopen " + args[0]);
  char line[4096];
  while (std::fgets(line, sizeof line, stream) != nullptr) std::printf("| %s", line);
  return Report("TLIBCPclose", args[0], TLIBCPclose(stream));
}

}  // namespace tavo_platform
