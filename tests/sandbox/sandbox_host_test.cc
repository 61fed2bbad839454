// tools/sandbox seen from the host: what the appliance does inside must leave
// no trace outside, and what crosses back (exit status, standard streams,
// the kept scratch) must be exact. These cases run on the host; the program
// re-runs itself inside the sandbox as a helper ("--helper NAME ARG").
#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <signal.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <map>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "support/syslog_capture.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace {

using tavow3::test::PathExists;
using tavow3::test::ReadBytes;
using tavow3::test::WaitUntil;

constexpr char kSandbox[] = TAVOW3_SANDBOX_SCRIPT;
constexpr char kTree[] = TAVOW3_SANDBOX_TREE;

std::string g_self;  // this program's absolute path, set by main()

std::string Self() { return g_self; }

// A name no other run shares: the cases run in parallel.
std::string Token() {
  const testing::TestInfo* info = testing::UnitTest::GetInstance()->current_test_info();
  return std::string("tavow3probe") + std::to_string(::getpid()) + info->name();
}

struct Result {
  int status = -1;  // exit code, or 128 + signal
  std::string out;
};

// A child with its stdout on a pipe, `input` on its stdin and its stderr in
// the file `err` when one is named.
class Child {
 public:
  Child(const std::vector<std::string>& argv, const std::string& input,
        const std::string& err = "") {
    int out[2];
    int in[2];
    if (::pipe2(out, O_CLOEXEC) != 0 || ::pipe2(in, O_CLOEXEC) != 0) return;
    pid_ = ::fork();
    if (pid_ == 0) {
      ::dup2(in[0], 0);
      ::dup2(out[1], 1);
      if (!err.empty()) {
        int err_fd = ::open(err.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
        if (err_fd < 0 || ::dup2(err_fd, 2) < 0) ::_exit(126);
      }
      std::vector<char*> args;
      for (const std::string& arg : argv) args.push_back(const_cast<char*>(arg.c_str()));
      args.push_back(nullptr);
      ::execv(args[0], args.data());
      ::_exit(127);
    }
    ::close(out[1]);
    ::close(in[0]);
    out_ = out[0];
    if (!input.empty()) (void)!::write(in[1], input.data(), input.size());
    ::close(in[1]);
  }
  ~Child() {
    if (pid_ > 0 && !waited_) {
      ::kill(pid_, SIGKILL);
      ::waitpid(pid_, nullptr, 0);
    }
    if (out_ >= 0) ::close(out_);
  }

  pid_t pid() const { return pid_; }

  // Reads one line of the child's stdout (without the newline).
  std::string ReadLine() {
    std::string line;
    char c;
    while (::read(out_, &c, 1) == 1 && c != '\n') line += c;
    return line;
  }

  // Reads the child's stdout to its end, then waits for the child.
  Result Wait() {
    Result result;
    char buffer[4096];
    ssize_t n;
    while ((n = ::read(out_, buffer, sizeof buffer)) > 0) result.out.append(buffer, n);
    result.status = WaitStatus();
    return result;
  }

  // Waits for the child only: whatever it left behind may still hold stdout.
  int WaitStatus() {
    int status = 0;
    waited_ = true;
    if (::waitpid(pid_, &status, 0) != pid_) return -1;
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
  }

 private:
  pid_t pid_ = -1;
  int out_ = -1;
  bool waited_ = false;
};

std::vector<std::string> SandboxArgv(const std::vector<std::string>& options,
                                     const std::vector<std::string>& command) {
  std::vector<std::string> argv = {kSandbox, "--root", kTree};
  argv.insert(argv.end(), options.begin(), options.end());
  argv.push_back("--");
  argv.insert(argv.end(), command.begin(), command.end());
  return argv;
}

Result RunSandbox(const std::vector<std::string>& command, const std::string& input = "",
                  const std::vector<std::string>& options = {}, const std::string& err = "") {
  return Child(SandboxArgv(options, command), input, err).Wait();
}

Result RunHelper(const std::string& name, const std::string& arg,
                 const std::vector<std::string>& options = {}, const std::string& err = "") {
  return RunSandbox({Self(), "--helper", name, arg}, "", options, err);
}

// Asks the host's iptables (no /dev/null: a bare chroot may lack it).
bool ChainExists(const std::string& chain) {
  const std::string err = chain + ".stderr";
  Result result = Child({"/usr/sbin/iptables", "-w", "-S", chain}, "", err).Wait();
  ::unlink(err.c_str());
  return result.status == 0;
}

// Processes are observed through the host's /proc, which a chroot may lack.
bool HostHasProc() { return PathExists("/proc/self/cmdline"); }

bool ProcessWithArgExists(const std::string& token) {
  DIR* proc = ::opendir("/proc");
  bool found = false;
  while (dirent* entry = proc ? ::readdir(proc) : nullptr) {
    std::string cmdline = ReadBytes(std::string("/proc/") + entry->d_name + "/cmdline");
    if (cmdline.find(token) != std::string::npos && std::atoi(entry->d_name) != ::getpid()) {
      found = true;
    }
  }
  if (proc) ::closedir(proc);
  return found;
}

// ---- helpers, run inside the sandbox ----

int WriteEverywhere(const std::string& token) {
  for (const char* dir : {"/usr/tavo", "/etc", "/var", "/run", "/tmp", "/dev", "/usr/bin"}) {
    std::ofstream(std::string(dir) + "/" + token) << "x";
  }
  int fd = ::shm_open("nginx_mod", O_RDWR | O_CREAT, 0644);
  if (fd < 0 || ::ftruncate(fd, 64) != 0) return 2;
  std::string chain = "iptables -w -N " + token.substr(0, 28);
  if (std::system(chain.c_str()) != 0) return 3;
  ::syslog(LOG_WARNING, "%s", token.c_str());
  std::vector<std::string> lines = tavow3::test::LogMessages(LOG_WARNING);
  if (lines != std::vector<std::string>{token}) return 4;
  return 0;
}

// Leaves a grandchild for PID 1 to reap; succeeds when it is gone, not a zombie.
int MakeOrphan() {
  int pipe_fds[2];
  if (::pipe(pipe_fds) != 0) return 2;
  pid_t child = ::fork();
  if (child == 0) {
    pid_t grandchild = ::fork();
    if (grandchild == 0) {
      std::this_thread::sleep_for(std::chrono::milliseconds(50));  // outlive the parent
      ::_exit(0);
    }
    (void)!::write(pipe_fds[1], &grandchild, sizeof grandchild);
    ::_exit(0);
  }
  pid_t grandchild = 0;
  if (::read(pipe_fds[0], &grandchild, sizeof grandchild) != sizeof grandchild) return 2;
  ::waitpid(child, nullptr, 0);
  std::string proc = "/proc/" + std::to_string(grandchild);
  return WaitUntil([&] { return !PathExists(proc); }) ? 0 : 1;
}

int Helper(const std::string& name, const std::string& arg) {
  if (name == "write-everywhere") return WriteEverywhere(arg);
  if (name == "make-orphan") return MakeOrphan();
  if (name == "leave-a-daemon") {
    if (::fork() == 0) {
      ::setsid();
      ::execlp("sleep", arg.c_str(), "300", nullptr);
      ::_exit(127);
    }
    return 0;
  }
  if (name == "print-ready-and-sleep") {
    std::printf("ready\n");
    std::fflush(stdout);
    ::execlp("sleep", arg.c_str(), "300", nullptr);
  }
  return 126;
}

// ---- the cases ----

TEST(Sandbox, LeavesTheHostUnchanged) {
  const std::string token = Token();
  std::vector<std::string> watched = {"/usr/tavo",   "/usr/bin/nginx",        "/usr/bin/iptables",
                                      "/dev/log",    "/dev/shm/nginx_mod",    "/run/tavow3-sandbox",
                                      "/run/tavow3", "/run/lock/tavow3.lock", "/var/tmp/nginx"};
  for (const char* dir : {"/usr/tavo", "/etc", "/var", "/run", "/tmp", "/dev", "/usr/bin"}) {
    watched.push_back(std::string(dir) + "/" + token);
  }
  std::map<std::string, bool> before;
  for (const std::string& path : watched) before[path] = PathExists(path);
  const std::string chain = token.substr(0, 28);
  ASSERT_FALSE(ChainExists(chain));

  Result result = RunHelper("write-everywhere", token);
  ASSERT_EQ(0, result.status) << "2-4: the shm, iptables or syslog step failed";

  for (const std::string& path : watched) EXPECT_EQ(before[path], PathExists(path)) << path;
  for (const char* dir : {"/etc", "/var", "/run", "/tmp", "/dev", "/usr/bin"}) {
    EXPECT_FALSE(PathExists(std::string(dir) + "/" + token)) << dir;
  }
  EXPECT_FALSE(ChainExists(chain));
}

TEST(Sandbox, PassesTheExitStatusThrough) {
  const struct {
    std::vector<std::string> command;
    std::vector<std::string> options;
    std::string input;
    int status;
  } cases[] = {
      {{"/bin/sh", "-c", "exit 0"}, {}, "", 0},
      {{"/bin/sh", "-c", "exit 3"}, {}, "", 3},
      {{"/bin/sh", "-c", "exit 255"}, {}, "", 255},
      {{"/bin/sh", "-c", "kill -TERM $$"}, {}, "", 128 + SIGTERM},
      {{"/bin/sh", "-c", "kill -KILL $$"}, {}, "", 128 + SIGKILL},
      {{"/no/such/program"}, {}, "", 127},
      {{}, {"--shell"}, "exit 6\n", 6},
      {{"/bin/sh", "-c", "exit 4"}, {"--shell"}, "exit 6\n", 4},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << (c.command.empty() ? "(shell)" : c.command.back()));
    EXPECT_EQ(c.status, RunSandbox(c.command, c.input, c.options).status);
  }
}

TEST(Sandbox, PassesStandardStreamsThrough) {
  Result result =
      RunSandbox({"/bin/sh", "-c", "read line; echo \"got $line\"; echo $$"}, "hello\n");
  EXPECT_EQ(0, result.status);
  EXPECT_EQ("got hello\n3\n", result.out) << "the command is the third process: init, sink, it";
}

TEST(Sandbox, ReapsOrphans) {
  EXPECT_EQ(0, RunHelper("make-orphan", "").status) << "an orphan stayed a zombie";
}

TEST(Sandbox, KillsWhatTheCommandLeftRunning) {
  if (!HostHasProc()) GTEST_SKIP() << "no /proc on this host to watch processes in";
  const std::string token = Token();
  EXPECT_EQ(0, RunHelper("leave-a-daemon", token).status);
  EXPECT_TRUE(WaitUntil([&] { return !ProcessWithArgExists(token); }));
}

TEST(Sandbox, TearsDownWhenKilled) {
  if (!HostHasProc()) GTEST_SKIP() << "no /proc on this host to watch processes in";
  const std::string token = Token();
  Child child(SandboxArgv({}, {Self(), "--helper", "print-ready-and-sleep", token}), "");
  ASSERT_EQ("ready", child.ReadLine());
  ASSERT_TRUE(ProcessWithArgExists(token));
  ASSERT_EQ(0, ::kill(child.pid(), SIGTERM));
  EXPECT_EQ(128 + SIGTERM, child.WaitStatus());
  EXPECT_TRUE(WaitUntil([&] { return !ProcessWithArgExists(token); }));
}

TEST(Sandbox, KeepsTheScratchWithTheLogOnRequest) {
  const std::string token = Token();
  const std::string err = token + ".stderr";
  Result result = RunHelper("write-everywhere", token, {"--keep"}, err);
  ASSERT_EQ(0, result.status);
  std::string said = ReadBytes(err);
  ::unlink(err.c_str());
  const std::string kept = "sandbox: kept ";
  ASSERT_EQ(0u, said.rfind(kept, 0)) << said;
  std::string scratch = said.substr(kept.size(), said.find('\n') - kept.size());
  ASSERT_EQ(0u, scratch.rfind("/tmp/tavow3-sandbox.", 0)) << scratch;
  EXPECT_EQ("x", ReadBytes(scratch + "/etc/upper/" + token));
  EXPECT_EQ("x", ReadBytes(scratch + "/tmp/" + token));
  std::string log = ReadBytes(scratch + "/run/tavow3-sandbox/syslog");
  EXPECT_NE(std::string::npos, log.find("<12>")) << log;  // LOG_USER | LOG_WARNING
  EXPECT_NE(std::string::npos, log.find(": " + token + "\n")) << log;
  std::string remove = "rm -rf --one-file-system " + scratch;
  EXPECT_EQ(0, std::system(remove.c_str()));
}

TEST(Sandbox, RefusesToStageOutsideItsPrivateTrees) {
  const std::string token = Token();
  const std::string tree = std::string(kTree) + "-" + token;
  std::string copy = "cp -a " + std::string(kTree) + " " + tree + " && mkdir -p " + tree +
                     "/opt && echo x > " + tree + "/opt/" + token;
  ASSERT_EQ(0, std::system(copy.c_str()));
  Result result = Child({kSandbox, "--root", tree, "--", "/bin/true"}, "").Wait();
  std::string remove = "rm -rf " + tree;
  EXPECT_EQ(0, std::system(remove.c_str()));
  EXPECT_EQ(125, result.status);
  EXPECT_FALSE(PathExists("/opt/" + token));
}

}  // namespace

int main(int argc, char** argv) {
  char self[PATH_MAX];
  if (::realpath(argv[0], self) == nullptr) {
    std::perror(argv[0]);
    return 2;
  }
  g_self = self;
  if (argc == 4 && std::string(argv[1]) == "--helper") return Helper(argv[2], argv[3]);
  testing::InitGoogleTest(&argc, argv);
  return RUN_ALL_TESTS();
}
