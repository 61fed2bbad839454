#include <tavow3/gen_nginx_conf.h>

#include <tavo/tlib_exec.h>

namespace {

constexpr char kGeneratorScript[] = "/usr/tavo/etc/rc.sysv/nginx-conf-generator.sh";

}  // namespace

GenNginxConf::GenNginxConf() : locked(lock_.lock()) {
  // The script reports its problems through the test that follows.
  if (locked) (void)TLIBCExec(kGeneratorScript);
}

bool GenNginxConf::TestNginxTmpConf() {
  return locked && TLIBCExec("/usr/bin/nginx", "-tc", "/var/tmp/nginx/nginx.conf") == 0;
}
