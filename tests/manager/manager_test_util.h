// Helpers of the configuration manager's tests. They call the C library
// directly, never the library's wrappers, so that armed fault hooks cannot
// touch them.
#ifndef TAVOW3_TESTS_MANAGER_MANAGER_TEST_UTIL_H_
#define TAVOW3_TESTS_MANAGER_MANAGER_TEST_UTIL_H_

#include <sys/types.h>

#include <chrono>
#include <functional>
#include <string>
#include <vector>

namespace tavow3::test {

inline constexpr char kCli[] = "/usr/tavo/bin/tavow3-nginxconf";
inline constexpr char kNginxScript[] = "/usr/tavo/etc/rc.sysv/nginx.sh";
inline constexpr char kGeneratorScript[] = "/usr/tavo/etc/rc.sysv/nginx-conf-generator.sh";
inline constexpr char kForceDefaultFlag[] = "/run/tavow3/force_default";
inline constexpr char kTmpMainConf[] = "/var/tmp/nginx/nginx.conf";
inline constexpr char kMainConf[] = "/etc/nginx/nginx.conf";
inline constexpr char kDefaultRule[] =
    "-A ZAM_DEFAULT_FORWARD -p tcp -m multiport --dports 5000,5001 -j ACCEPT";

// Writes `bytes` to `path` (parents made) with `mode`.
void WriteFileAt(const std::string& path, const std::string& bytes, mode_t mode = 0644);
// Whole content of `path`, or "<missing>".
std::string FileBytes(const std::string& path);
bool PathExists(const std::string& path);  // lstat: links not followed
std::string LinkTarget(const std::string& path);  // "" when not a link
void RemoveTree(const std::string& path);
// Names in directory `dir`, sorted; empty when it is missing.
std::vector<std::string> ListDir(const std::string& dir);

struct RunResult {
  int status = -1;  // exit status, or -1 when killed or not run
  std::string out;
  std::string err;
};
// Runs argv (no shell) with standard input from /dev/null and waits.
RunResult RunCommand(const std::vector<std::string>& argv);

// Lines of "iptables -S" in this sandbox.
std::vector<std::string> IptablesRules();
bool HasDefaultRule();

// Stores `text` (padded with zeros) as the shared-memory mode record,
// bypassing the recorder and its alert.
void WriteModeRecord(const std::string& text);
// The record's text up to its first NUL, or "<none>".
std::string ModeRecordText();

// The lines logged by the deployment code ("nginx_deploy:...") so far.
std::vector<std::string> DeployLog();
// The same at one syslog priority.
std::vector<std::string> DeployLog(int priority);

// Makes the firewall service file "tavow3.sc" impossible to replace or
// delete (a directory stands there), so its regeneration fails.
void BreakFirewallFile();
// Makes the TLS-profile store unreadable, so the certificate synchronisation fails.
void BreakCertificates();
// Makes the nginx job look running: /run/nginx.pid names this process.
void PretendNginxRuns();

// Polls `done` every 20 ms until it is true or `timeout` passed; its last value.
bool WaitUntil(const std::function<bool()>& done,
               std::chrono::milliseconds timeout = std::chrono::seconds(15));

// The body that `url` serves (curl, certificates not checked), or "<no answer>".
std::string Fetch(const std::string& url);

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_MANAGER_MANAGER_TEST_UTIL_H_
