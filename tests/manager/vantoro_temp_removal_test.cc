// Setting the trusted-proxy list removes its temporary at the end of every
// run, also when mkstemp created none: the removal then tries the pattern's
// name and reports a file system that refuses it.
#include <tavow3/nginx_conf_manager.h>

#include <cerrno>
#include <optional>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "base/fault.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"
#include "support/test_mounts.h"

namespace tavow3::test {
namespace {

namespace fault = base::fault;

constexpr char kDir[] = "/var/tmp/nginx/trusted_proxy";
constexpr char kList[] = "/var/tmp/nginx/trusted_proxy/vantoro.conf";
constexpr char kOldList[] = "set_real_ip_from 198.51.100.1;\n";

// "nginx_deploy:1088 ..." for the error text `error`, as a whole-line pattern.
std::string CreateFailed(const std::string& error) {
  return "\\Qnginx_deploy:1088 Fail to create temp file "
         "(/var/tmp/nginx/trusted_proxy/vantoro.conf.XXXXXX, " + error + ")\\E";
}

// The removal's line; mkstemp may have left its own six characters in the name.
std::string RemoveFailed(const std::string& error) {
  return "\\Qnginx_deploy:1120 Fail to remove temp file "
         "/var/tmp/nginx/trusted_proxy/vantoro.conf.\\E[A-Za-z0-9]{6}\\Q, " + error + "\\E";
}

TEST(NginxConfOperatorSetVantoroProxy, FailedMkstempStillEndsWithTheTemporaryRemoval) {
  struct Case {
    const char* what;
    bool read_only;                     // the list's directory refuses every change
    std::optional<int> mkstemp_errno;   // or mkstemp alone fails with this
    std::vector<std::string> patterns;  // the deployment log, line by line
  };
  const Case cases[] = {
      {"mkstemp fails, nothing to remove", false, EIO, {CreateFailed("Input/output error")}},
      {"read-only directory",
       true,
       std::nullopt,
       {CreateFailed("Read-only file system"), RemoveFailed("Read-only file system")}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    RemoveTree(kDir);
    WriteBytes(kList, kOldList);
    std::optional<ScopedMount> mount;
    if (c.read_only) {
      mount.emplace(ScopedMount::ReadOnly(kDir));
      ASSERT_TRUE(mount->ok());
    }
    ClearLog();
    int result;
    std::string msg;
    {
      std::optional<fault::Arm> arm;
      if (c.mkstemp_errno) arm.emplace(1, fault::kOnce, *c.mkstemp_errno, fault::Op::kMkstemp);
      NginxConfManager manager(NGINXCONF_SET_VANTORO_PROXY);
      result = manager.run_with_args({"192.0.2.1"});
      msg = manager.GetMsg();
      if (arm) {
        EXPECT_TRUE(arm->fired());
      }
    }
    EXPECT_EQ(-1, result);
    EXPECT_EQ("", msg);
    EXPECT_EQ(kOldList, ReadBytes(kList));
    EXPECT_EQ(std::vector<std::string>{"vantoro.conf"}, DirNames(kDir));
    const std::vector<std::string> log = TaggedLogMessages("nginx_deploy");
    ASSERT_EQ(c.patterns.size(), log.size()) << testing::PrintToString(log);
    for (size_t i = 0; i < log.size(); ++i) {
      EXPECT_TRUE(HasLogMatching({log[i]}, c.patterns[i])) << log[i];
    }
  }
}

}  // namespace
}  // namespace tavow3::test
