// The appliance's web server for end-to-end cases: started through its
// control script before each case and stopped after it, and the ports that
// the installed firewall service file declares.
#ifndef TAVOW3_TESTS_SUPPORT_TEST_NGINX_H_
#define TAVOW3_TESTS_SUPPORT_TEST_NGINX_H_

#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace tavow3::test {

inline constexpr char kNginxScript[] = "/usr/tavo/etc/rc.sysv/nginx.sh";

// The ports of every section of the installed "tavow3.sc" firewall service
// file, read with the platform's reader; empty when it cannot be read.
std::vector<std::string> DeclaredPorts();
bool Declares(const std::string& port);

// Starts the web server ("nginx.sh start" must exit 0) and stops it again.
class NginxRunning : public testing::Test {
 protected:
  void SetUp() override;
  void TearDown() override;
};

}  // namespace tavow3::test

#endif  // TAVOW3_TESTS_SUPPORT_TEST_NGINX_H_
