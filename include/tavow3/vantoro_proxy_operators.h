// The operators that keep the relay service's servers in the web server's
// trusted-proxy list "/var/tmp/nginx/trusted_proxy/vantoro.conf", one
// "set_real_ip_from ADDRESS;" line per server. They only write the file;
// nginx reads it on its next start or reload.
#ifndef TAVOW3_VANTORO_PROXY_OPERATORS_H_
#define TAVOW3_VANTORO_PROXY_OPERATORS_H_

#include <string>
#include <vector>

#include <tavow3/export.h>
#include <tavow3/nginx_conf_operator.h>

// Replaces the list by the addresses given to set_args, atomically (the live
// file changes only by the final rename; owner 0:0, mode 0644). An empty list
// deletes the file. run() returns 0 or -1 (logged).
class TAVOW3_EXPORT NginxConfOperatorSetVantoroProxy : public NginxConfOperatorWithArgs {
 public:
  // Keeps `args` when every one is a plain IPv4 or IPv6 address (no prefix
  // length, no host name); otherwise appends "<arg> is an invalid IP\n" for
  // the first bad one and keeps the previous list. An empty list is valid.
  [[nodiscard]] bool set_args(std::vector<std::string> args) override;
  int run() override;

 private:
  std::vector<std::string> addresses_;
};

// Deletes the list file (a link there is removed, not its target). 0 also
// when there is none; -1 (logged) when it cannot be deleted.
class TAVOW3_EXPORT NginxConfOperatorClearVantoroProxy : public tavow3::NginxConfOperator {
 public:
  int run() override;
};

// Lists the addresses of the file, one per line, in file order: each word
// after a "set_real_ip_from" word without its last character. 0 with an empty
// message when there is no file; -1 (logged) when it cannot be read.
class TAVOW3_EXPORT NginxConfOperatorListVantoroProxy : public tavow3::NginxConfOperator {
 public:
  int run() override;
};

#endif  // TAVOW3_VANTORO_PROXY_OPERATORS_H_
