#include "deploy_fixtures.h"

#include <glob.h>

#include <algorithm>

#include "support/test_files.h"

namespace tavow3::test {

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
  WriteBytes(kGeneratorScript,
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
  const std::string runs = ReadBytes("/tmp/generator.runs");
  return runs == "<missing>" ? 0 : static_cast<int>(std::count(runs.begin(), runs.end(), '\n'));
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

}  // namespace tavow3::test
