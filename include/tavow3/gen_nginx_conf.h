// Generation of the temporary nginx configuration under the generation lock.
#ifndef TAVOW3_GEN_NGINX_CONF_H_
#define TAVOW3_GEN_NGINX_CONF_H_

#include <tavow3/export.h>
#include <tavow3/lock.h>

// Construction takes the generation lock (blocking) and, once it holds it,
// runs the appliance's configuration generator script, which writes the
// temporary tree under /var/tmp/nginx. The lock is held until destruction, so
// the test of the result runs under it too. Used by one thread.
class TAVOW3_EXPORT GenNginxConf {
 public:
  GenNginxConf();

  // Tests "/var/tmp/nginx/nginx.conf" with nginx. False when the lock was
  // not obtained (nothing was generated) or nginx refused the configuration.
  [[nodiscard]] bool TestNginxTmpConf();

 private:
  Lock lock_;
  bool locked;
};

#endif  // TAVOW3_GEN_NGINX_CONF_H_
