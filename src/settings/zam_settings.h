// The settings record of ZAM, shared by the files that implement it.
#ifndef TAVOW3_SRC_SETTINGS_ZAM_SETTINGS_H_
#define TAVOW3_SRC_SETTINGS_ZAM_SETTINGS_H_

#include <tavow3/zam.h>

#include <string>
#include <vector>

namespace tavow3 {

struct ZAM::Settings {
  unsigned short http_port = 0;
  unsigned short https_port = 0;
  bool spdy = false;
  bool hsts = false;
  // Read from the file only; no default of its own and never written back.
  bool http2 = false;
  bool https_redirect = false;
  std::string certificate;
  std::string key;
  bool access_default_port = false;
  std::string fqdn;
  bool http_compression = false;
  bool customized_max_connections = false;
  int max_connections = 0;
  int upper_limit_connections = 0;
  int lower_limit_connections = 0;
  std::string server_header;
  std::vector<std::string> trust_proxies;
};

}  // namespace tavow3

#endif  // TAVOW3_SRC_SETTINGS_ZAM_SETTINGS_H_
