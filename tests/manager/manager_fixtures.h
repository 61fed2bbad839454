// What the configuration manager's tests share beyond tests/support: the
// appliance's paths, the shared-memory mode record written and read behind
// the recorder's back, and breakages of the generation's steps.
#ifndef TAVOW3_TESTS_MANAGER_MANAGER_FIXTURES_H_
#define TAVOW3_TESTS_MANAGER_MANAGER_FIXTURES_H_

#include <string>

namespace tavow3::test {

inline constexpr char kCli[] = "/usr/tavo/bin/tavow3-nginxconf";
inline constexpr char kGeneratorScript[] = "/usr/tavo/etc/rc.sysv/nginx-conf-generator.sh";
inline constexpr char kForceDefaultFlag[] = "/run/tavow3/force_default";
inline constexpr char kTmpMainConf[] = "/var/tmp/nginx/nginx.conf";
inline constexpr char kMainConf[] = "/etc/nginx/nginx.conf";
inline constexpr char kDefaultRule[] =
    "-A ZAM_DEFAULT_FORWARD -p tcp -m multiport --dports 5000,5001 -j ACCEPT";

// Whether a new open file description gets the generation lock
// "/run/lock/nginx_gen.lock" now; false when the file is missing.
bool GenerationLockIsFree();

// Whether "iptables -S" lists kDefaultRule.
bool HasDefaultRule();

// Stores `text` (padded with zeros) as the shared-memory mode record,
// bypassing the recorder and its alert.
void WriteModeRecord(const std::string& text);
// The record's text up to its first NUL, or "<none>".
std::string ModeRecordText();

// Makes the firewall service file "tavow3.sc" impossible to replace or
// delete (a directory stands there), so its regeneration fails.
void BreakFirewallFile();
// Makes the TLS-profile store unreadable, so the certificate synchronisation fails.
void BreakCertificates();
// Makes the nginx job look running: /run/nginx.pid names this process.
void PretendNginxRuns();

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_MANAGER_MANAGER_FIXTURES_H_
