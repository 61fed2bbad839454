// Operators of the web-server configuration manager and their numbers.
#ifndef TAVOW3_NGINX_CONF_OPERATOR_H_
#define TAVOW3_NGINX_CONF_OPERATOR_H_

#include <cstdint>
#include <string>
#include <vector>

#include <tavow3/export.h>

namespace tavow3 {

// Operation numbers. The values are fixed: service scripts and the C
// interface pass them as plain integers. Any other int32 value may be passed
// in; the manager refuses it.
enum NGINXCONF_OPERATOR : int32_t {
  NGINXCONF_DEPLOY_INIT = 0,
  NGINXCONF_DEPLOY_HUP = 1,
  NGINXCONF_GEN_W3_CONF = 2,
  NGINXCONF_GEN_W3_SC = 3,
  NGINXCONF_GEN_NGINX_CONF = 4,
  NGINXCONF_GET_MODE = 5,
  NGINXCONF_FORCE_DEFAULT = 6,
  NGINXCONF_IS_FORCED_DEFAULT = 7,
  NGINXCONF_SET_VANTORO_PROXY = 8,
  NGINXCONF_CLEAR_VANTORO_PROXY = 9,
  NGINXCONF_LIST_VANTORO_PROXY = 10,
};

// One operation on the web server's configuration. run() returns 0 for
// success (or the Normal mode), a positive mode number, or -1 for failure;
// GetMsg() holds the human-readable result lines, each ending in "\n".
// An operator is used by one thread, once.
class TAVOW3_EXPORT NginxConfOperator {
 public:
  virtual ~NginxConfOperator();
  virtual int run() = 0;
  std::string GetMsg() const { return msg_; }

 protected:
  std::string msg_;
};

}  // namespace tavow3

// The operation numbers are also usable without the namespace.
using tavow3::NGINXCONF_OPERATOR;
using tavow3::NGINXCONF_DEPLOY_INIT;
using tavow3::NGINXCONF_DEPLOY_HUP;
using tavow3::NGINXCONF_GEN_W3_CONF;
using tavow3::NGINXCONF_GEN_W3_SC;
using tavow3::NGINXCONF_GEN_NGINX_CONF;
using tavow3::NGINXCONF_GET_MODE;
using tavow3::NGINXCONF_FORCE_DEFAULT;
using tavow3::NGINXCONF_IS_FORCED_DEFAULT;
using tavow3::NGINXCONF_SET_VANTORO_PROXY;
using tavow3::NGINXCONF_CLEAR_VANTORO_PROXY;
using tavow3::NGINXCONF_LIST_VANTORO_PROXY;

// An operator that takes arguments before it runs.
class TAVOW3_EXPORT NginxConfOperatorWithArgs : public tavow3::NginxConfOperator {
 public:
  // Validates and keeps `args`; false leaves the operator unchanged.
  virtual bool set_args(std::vector<std::string> args) = 0;
};

#endif  // TAVOW3_NGINX_CONF_OPERATOR_H_
