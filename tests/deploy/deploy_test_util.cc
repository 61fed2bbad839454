#include "deploy_test_util.h"

#include <fcntl.h>
#include <glob.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <dirent.h>
#include <fstream>
#include <sstream>
#include <thread>

#include <gtest/gtest.h>

#include "support/syslog_capture.h"

namespace tavow3::test {

const char kGeneratorScript[] = "/usr/tavo/etc/rc.sysv/nginx-conf-generator.sh";

void WriteFileAt(const std::string& path, const std::string& bytes, mode_t mode) {
  const std::string dir = path.substr(0, path.rfind('/'));
  if (!dir.empty()) {
    ASSERT_EQ(0, RunProgram({"/bin/mkdir", "-p", dir})) << dir;
  }
  {
    std::ofstream out(path, std::ios::trunc | std::ios::binary);
    out << bytes;
    ASSERT_TRUE(out.good()) << path;
  }
  ASSERT_EQ(0, ::chmod(path.c_str(), mode)) << path;
}

std::string FileBytes(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) return "<missing>";
  std::ostringstream out;
  out << in.rdbuf();
  return out.str();
}

bool PathExists(const std::string& path) {
  struct stat st;
  return ::lstat(path.c_str(), &st) == 0;
}

bool IsDirectory(const std::string& path) {
  struct stat st;
  return ::lstat(path.c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

std::string LinkTarget(const std::string& path) {
  char buffer[4096];
  const ssize_t n = ::readlink(path.c_str(), buffer, sizeof buffer);
  return n < 0 ? std::string() : std::string(buffer, n);
}

ino_t InodeOf(const std::string& path) {
  struct stat st;
  return ::lstat(path.c_str(), &st) == 0 ? st.st_ino : 0;
}

void RemoveTree(const std::string& path) {
  ASSERT_EQ(0, RunProgram({"/bin/rm", "-rf", path})) << path;
}

std::vector<std::string> BackupsOf(const std::string& path) {
  std::vector<std::string> names;
  glob_t matches;
  if (::glob((path + "_??????").c_str(), 0, nullptr, &matches) == 0) {
    names.assign(matches.gl_pathv, matches.gl_pathv + matches.gl_pathc);
    ::globfree(&matches);
  }
  return names;
}

int RunProgram(const std::vector<std::string>& argv, std::string* output) {
  int fds[2];
  if (::pipe2(fds, O_CLOEXEC) != 0) return -1;
  const pid_t pid = ::fork();
  if (pid == 0) {
    ::dup2(fds[1], STDOUT_FILENO);
    ::dup2(fds[1], STDERR_FILENO);
    std::vector<char*> args;
    for (const std::string& arg : argv) args.push_back(const_cast<char*>(arg.c_str()));
    args.push_back(nullptr);
    ::execv(args[0], args.data());
    ::_exit(127);
  }
  ::close(fds[1]);
  std::string text;
  char buffer[4096];
  ssize_t n;
  while ((n = ::read(fds[0], buffer, sizeof buffer)) > 0 || (n < 0 && errno == EINTR)) {
    if (n > 0) text.append(buffer, n);
  }
  ::close(fds[0]);
  int status = 0;
  if (pid < 0 || ::waitpid(pid, &status, 0) != pid) return -1;
  if (output != nullptr) *output = text;
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

std::vector<std::string> IptablesRules() {
  std::string text;
  EXPECT_EQ(0, RunProgram({"/usr/bin/iptables", "-S"}, &text)) << text;
  std::vector<std::string> lines;
  std::istringstream in(text);
  for (std::string line; std::getline(in, line);) lines.push_back(line);
  return lines;
}

std::vector<std::string> DeployLog() {
  std::vector<std::string> lines;
  for (const std::string& line : LogMessages()) {
    if (line.rfind("nginx_deploy:", 0) == 0) lines.push_back(line);
  }
  return lines;
}

bool WaitUntil(const std::function<bool()>& done, std::chrono::milliseconds timeout) {
  const auto deadline = std::chrono::steady_clock::now() + timeout;
  while (!done()) {
    if (std::chrono::steady_clock::now() >= deadline) return done();
    std::this_thread::sleep_for(std::chrono::milliseconds(10));
  }
  return true;
}

std::vector<pid_t> ChildrenInState(char state) {
  std::vector<pid_t> children;
  DIR* proc = ::opendir("/proc");
  if (proc == nullptr) return children;
  while (dirent* entry = ::readdir(proc)) {
    const pid_t pid = std::atoi(entry->d_name);
    if (pid <= 0) continue;
    // "pid (comm) S ppid ...": the name may hold spaces, so parse after ')'.
    const std::string stat = FileBytes("/proc/" + std::to_string(pid) + "/stat");
    const size_t close = stat.rfind(')');
    if (close == std::string::npos) continue;
    std::istringstream fields(stat.substr(close + 1));
    char process_state = 0;
    pid_t ppid = 0;
    fields >> process_state >> ppid;
    if (ppid == ::getpid() && (state == 0 || process_state == state)) children.push_back(pid);
  }
  ::closedir(proc);
  return children;
}

std::string MainConf(const std::string& marker) {
  return "# " + marker +
         "\n"
         "pid /run/nginx-test.pid;\n"
         "error_log stderr;\n"
         "events {}\n"
         "http {\n"
         "  access_log off;\n"
         "  include /etc/nginx/conf.d/*.conf;\n"
         "  include /etc/nginx/sites-enabled/*;\n"
         "  include /etc/nginx/app.d/*.conf;\n"
         "}\n";
}

void InstallGenerator(bool valid) {
  const std::string conf = valid ? MainConf("generated") : "events {\n";
  WriteFileAt(kGeneratorScript,
              "#!/bin/sh\n"
              "echo run >> /tmp/generator.runs\n"
              "mkdir -p /var/tmp/nginx/app.d\n"
              "cat > /var/tmp/nginx/nginx.conf <<'CONF'\n" +
                  conf +
                  "CONF\n"
                  "echo 'server { listen 127.0.0.1:8090; }' > /var/tmp/nginx/app.d/app.conf\n",
              0755);
}

int GeneratorRuns() {
  const std::string runs = FileBytes("/tmp/generator.runs");
  return runs == "<missing>" ? 0 : static_cast<int>(std::count(runs.begin(), runs.end(), '\n'));
}

}  // namespace tavow3::test
