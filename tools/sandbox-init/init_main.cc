// PID 1 of a sandbox, started by tools/sandbox in new PID, mount and network
// namespaces:
//
//   tavow3-sandbox-init --root DIR [--keep DIR] [--visible DIR]... [--shell]
//                       -- COMMAND [ARG...]
//
// Sets up the appliance (appliance_setup.h), starts the /dev/log sink, runs
// COMMAND, reaps every process that the namespace hands to it, forwards
// SIGINT/SIGTERM/SIGHUP/SIGQUIT to COMMAND and exits with COMMAND's status
// (128 + N for signal N). With --shell an interactive shell follows COMMAND,
// or replaces it when none is given. On exit every process left in the
// namespace is killed.
#include <errno.h>
#include <limits.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "appliance_setup.h"
#include "syslog_sink.h"

namespace {

constexpr char kLogDir[] = "/run/tavow3-sandbox";
constexpr char kLogFile[] = "/run/tavow3-sandbox/syslog";
constexpr char kLogSocket[] = "/dev/log";
constexpr int kForwardedSignals[] = {SIGINT, SIGTERM, SIGHUP, SIGQUIT};

volatile sig_atomic_t g_foreground = 0;  // pid the forwarded signals go to

void Forward(int signal_number) {
  if (g_foreground > 0) (void)::kill(g_foreground, signal_number);
}

void InstallForwarding() {
  struct sigaction action {};
  action.sa_handler = Forward;
  sigemptyset(&action.sa_mask);
  for (int signal_number : kForwardedSignals) (void)::sigaction(signal_number, &action, nullptr);
}

int ExitStatus(int wait_status) {
  if (WIFEXITED(wait_status)) return WEXITSTATUS(wait_status);
  if (WIFSIGNALED(wait_status)) return 128 + WTERMSIG(wait_status);
  return 125;
}

// Runs `argv` and reaps children until it exits; returns its exit status.
int RunAndReap(const std::vector<char*>& argv, pid_t sink) {
  pid_t pid = ::fork();
  if (pid < 0) {
    std::perror("sandbox-init: fork");
    return 125;
  }
  if (pid == 0) {
    struct sigaction action {};
    action.sa_handler = SIG_DFL;
    for (int signal_number : kForwardedSignals) (void)::sigaction(signal_number, &action, nullptr);
    std::vector<char*> args(argv);
    args.push_back(nullptr);
    ::execvp(args[0], args.data());
    std::fprintf(stderr, "sandbox-init: cannot run %s: %s\n", args[0], std::strerror(errno));
    ::_exit(127);
  }
  g_foreground = pid;
  for (;;) {
    int wait_status = 0;
    pid_t reaped = ::waitpid(-1, &wait_status, 0);
    if (reaped < 0) {
      if (errno == EINTR) continue;
      std::perror("sandbox-init: waitpid");
      return 125;
    }
    if (reaped == sink) std::fprintf(stderr, "sandbox-init: the syslog sink stopped\n");
    if (reaped == pid) {
      g_foreground = 0;
      return ExitStatus(wait_status);
    }
  }
}

void KillTheRest() {
  (void)::kill(-1, SIGKILL);
  while (::waitpid(-1, nullptr, 0) > 0 || errno == EINTR) {
  }
}

int Usage() {
  std::fprintf(stderr,
               "usage: tavow3-sandbox-init --root DIR [--keep DIR] [--visible DIR]... [--shell]\n"
               "                           -- COMMAND [ARG...]\n");
  return 125;
}

struct Arguments {
  tavow3::sandbox::SetupOptions setup;
  bool shell = false;
  std::vector<char*> command;
};

bool ParseArguments(int argc, char** argv, Arguments* args) {
  int first = 1;
  for (; first < argc; ++first) {
    std::string arg = argv[first];
    bool has_value = first + 1 < argc;
    if (arg == "--shell") {
      args->shell = true;
    } else if (arg == "--keep" && has_value) {
      args->setup.keep_dir = argv[++first];
    } else if (arg == "--root" && has_value) {
      args->setup.root = argv[++first];
    } else if (arg == "--visible" && has_value) {
      args->setup.visible.push_back(argv[++first]);
    } else if (arg == "--") {
      ++first;
      break;
    } else {
      return false;
    }
  }
  args->command.assign(argv + first, argv + argc);
  if ((args->command.empty() && !args->shell) || args->setup.root.empty()) return false;
  // The command's own directory stays visible too (a program under /tmp).
  char path[PATH_MAX];
  if (!args->command.empty() && std::strchr(args->command[0], '/') != nullptr &&
      ::realpath(args->command[0], path) != nullptr) {
    std::string resolved = path;
    args->setup.visible.push_back(resolved.substr(0, resolved.rfind('/')));
  }
  return true;
}

}  // namespace

int main(int argc, char** argv) {
  Arguments args;
  if (!ParseArguments(argc, argv, &args)) return Usage();
  if (::getpid() != 1) {
    std::fprintf(stderr, "sandbox-init: must run as PID 1 of a new PID namespace\n");
    return 125;
  }
  if (!tavow3::sandbox::SetUpAppliance(args.setup)) return 125;
  if (::mkdir(kLogDir, 0755) != 0 && errno != EEXIST) {
    std::fprintf(stderr, "sandbox-init: mkdir %s: %s\n", kLogDir, std::strerror(errno));
    return 125;
  }
  pid_t sink = tavow3::sandbox::StartSyslogSink(kLogSocket, kLogFile);
  if (sink < 0) return 125;
  InstallForwarding();

  int status = 0;
  if (!args.command.empty()) status = RunAndReap(args.command, sink);
  if (args.shell) {
    char bash[] = "/bin/bash";
    char interactive[] = "-i";
    int shell_status = RunAndReap({bash, interactive}, sink);
    if (args.command.empty()) status = shell_status;
  }
  KillTheRest();
  return status;
}
