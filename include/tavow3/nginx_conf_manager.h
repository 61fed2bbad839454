// The single entry point through which service scripts and tools act on the
// web server's configuration.
#ifndef TAVOW3_NGINX_CONF_MANAGER_H_
#define TAVOW3_NGINX_CONF_MANAGER_H_

#include <string>
#include <vector>

#include <tavow3/export.h>
#include <tavow3/nginx_conf_operator.h>

namespace tavow3 {

// Creates the operator for one operation number and runs it. An unknown
// number is logged ("bad parrameter") and gives a manager whose runs return
// -1 and whose message is empty. Made for one operation; not thread-safe.
class TAVOW3_EXPORT NginxConfManager {
 public:
  explicit NginxConfManager(NGINXCONF_OPERATOR op);
  ~NginxConfManager();
  NginxConfManager(const NginxConfManager&) = delete;
  NginxConfManager& operator=(const NginxConfManager&) = delete;

  // The operator's result, or -1 without an operator.
  int run();
  // Passes `args` to an operator that takes arguments, then runs it; -1 (and
  // a log line naming the operator's type) for any other operator, -1 without
  // running when the arguments are refused.
  int run_with_args(std::vector<std::string> args);
  // The operator's result lines, or "" without an operator.
  std::string GetMsg() const;

 private:
  NginxConfOperator* op_;
};

}  // namespace tavow3

// Runs the mode query: 0 when the web server runs its Normal configuration,
// 1 for a fall-back (Abnormal or Default), -1 when no mode is recorded.
extern "C" TAVOW3_EXPORT int TAVOServiceIsHttpDefaultConf(void);

#endif  // TAVOW3_NGINX_CONF_MANAGER_H_
