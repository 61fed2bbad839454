// The nginx files of a deployment that the deployment tests set up: a main
// configuration that includes the three fragment directories under
// /etc/nginx, a generator script that writes one, and the backups that the
// deployment leaves beside a path.
#ifndef TAVOW3_TESTS_DEPLOY_DEPLOY_FIXTURES_H_
#define TAVOW3_TESTS_DEPLOY_DEPLOY_FIXTURES_H_

#include <string>
#include <vector>

namespace tavow3::test {

inline constexpr char kGeneratorScript[] = "/usr/tavo/etc/rc.sysv/nginx-conf-generator.sh";

// A main configuration that nginx accepts, marked with the comment `marker`.
std::string MainConf(const std::string& marker);
// Installs a generator script that appends a line to /tmp/generator.runs and
// writes /var/tmp/nginx/nginx.conf, valid or broken, and one app.d fragment.
void InstallGenerator(bool valid);
// Lines of /tmp/generator.runs.
int GeneratorRuns();
// The backups of `path`: "<path>_" followed by six characters, sorted.
std::vector<std::string> BackupsOf(const std::string& path);

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_DEPLOY_DEPLOY_FIXTURES_H_
