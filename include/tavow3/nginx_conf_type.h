// The configuration modes of the web server.
#ifndef TAVOW3_NGINX_CONF_TYPE_H_
#define TAVOW3_NGINX_CONF_TYPE_H_

#include <cstdint>

// A configuration mode. The numbers are fixed: they are stored in the mode
// record and returned to service scripts. Other values may be passed in and
// are refused where a mode is applied.
enum NGINXCONF_TYPE : int32_t {
  NGINXCONF_NONE = -1,
  NGINXCONF_NORMAL = 0,    // the full configuration
  NGINXCONF_ABNORMAL = 1,  // without conf.d and sites-enabled, keeping app.d
  NGINXCONF_DEFAULT = 2,   // files untouched, management ports opened in the firewall
};

#endif  // TAVOW3_NGINX_CONF_TYPE_H_
