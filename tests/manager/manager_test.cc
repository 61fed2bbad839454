// The manager's dispatch, its refusals, the mode query and the force-default flag.
#include <tavow3/nginx_conf_manager.h>
#include <tavow3/nginx_conf_operators.h>
#include <tavow3/vantoro_proxy_operators.h>

#include <syslog.h>
#include <unistd.h>

#include <climits>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "manager_fixtures.h"
#include "support/fake_tools.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::test {
namespace {

using Lines = std::vector<std::string>;

constexpr char kVantoroList[] = "/var/tmp/nginx/trusted_proxy/vantoro.conf";

NGINXCONF_OPERATOR Op(int value) { return static_cast<NGINXCONF_OPERATOR>(value); }

TEST(NginxConfManager, UnknownOperatorIsLoggedOnceAndEveryCallFails) {
  for (int value : {-1, 11, 42, INT_MIN, INT_MAX}) {
    SCOPED_TRACE(value);
    ClearLog();
    NginxConfManager manager(Op(value));
    EXPECT_EQ(-1, manager.run());
    EXPECT_EQ(-1, manager.run_with_args({"192.0.2.1"}));
    EXPECT_EQ(-1, manager.run_with_args({}));
    EXPECT_EQ("", manager.GetMsg());
    EXPECT_EQ(Lines{"nginx_deploy:800 bad parrameter"}, TaggedLogMessages("nginx_deploy", LOG_ERR));
  }
  EXPECT_FALSE(PathExists(kVantoroList));
}

struct RefusalCase {
  int op;
  const char* type_name;
};

TEST(NginxConfManager, RunWithArgsRefusesEveryOperatorWithoutArgumentsAndRunsNothing) {
  const std::vector<RefusalCase> cases = {
      {0, "32NginxConfOperatorDeployNginxInit"}, {1, "31NginxConfOperatorDeployNginxHup"},
      {2, "26NginxConfOperatorGenW3Conf"},       {3, "24NginxConfOperatorGenW3SC"},
      {4, "29NginxConfOperatorGenNginxConf"},    {5, "24NginxConfOperatorGetMode"},
      {6, "29NginxConfOperatorForceDefault"},    {7, "32NginxConfOperatorIsForcedDefault"},
      {9, "34NginxConfOperatorClearVantoroProxy"}, {10, "33NginxConfOperatorListVantoroProxy"},
  };
  WriteBytes(kVantoroList, "set_real_ip_from 192.0.2.1;\n");
  PretendNginxRuns();
  for (const RefusalCase& c : cases) {
    for (const Lines& args : {Lines{}, Lines{"192.0.2.7"}}) {
      SCOPED_TRACE(testing::Message() << "operator " << c.op << ", " << args.size() << " args");
      ClearLog();
      NginxConfManager manager(Op(c.op));
      EXPECT_EQ(-1, manager.run_with_args(args));
      EXPECT_EQ("", manager.GetMsg());
      EXPECT_EQ(Lines{std::string("nginx_deploy:826 ") + c.type_name +
                      " not support setting argument."},
                TaggedLogMessages("nginx_deploy"));
    }
  }
  // None of them ran: no generation, no mode, no flag, no list change, no firewall.
  EXPECT_FALSE(PathExists(kTmpMainConf));
  EXPECT_FALSE(PathExists(kForceDefaultFlag));
  EXPECT_EQ("<none>", ModeRecordText());
  EXPECT_EQ("set_real_ip_from 192.0.2.1;\n", ReadBytes(kVantoroList));
  EXPECT_TRUE(FakeCalls("tavofirewall").empty());
  EXPECT_FALSE(HasDefaultRule());
}

TEST(NginxConfManager, RunWithArgsPassesArgumentsToTheSetOperator) {
  NginxConfManager refused(NGINXCONF_SET_VANTORO_PROXY);
  EXPECT_EQ(-1, refused.run_with_args({"192.0.2.1", "not-an-address"}));
  EXPECT_EQ("not-an-address is an invalid IP\n", refused.GetMsg());
  EXPECT_FALSE(PathExists(kVantoroList));

  NginxConfManager manager(NGINXCONF_SET_VANTORO_PROXY);
  EXPECT_EQ(0, manager.run_with_args({"192.0.2.1"}));
  EXPECT_EQ("List of Vantoro servers is set.\n", manager.GetMsg());
  EXPECT_EQ("set_real_ip_from 192.0.2.1;\n", ReadBytes(kVantoroList));

  // Without arguments the list is empty: the file goes.
  NginxConfManager cleared(NGINXCONF_SET_VANTORO_PROXY);
  EXPECT_EQ(0, cleared.run());
  EXPECT_FALSE(PathExists(kVantoroList));
}

struct ModeCase {
  const char* record;  // nullptr: no record at all
  int mode;
  const char* msg;
  int is_default;
};

TEST(NginxConfManager, GetModeAndIsHttpDefaultConfReportEveryRecord) {
  const std::vector<ModeCase> cases = {
      {nullptr, -1, "Failed to get nginx mode\n", -1},
      {"0", 0, "Nginx run in normal mode\n", 0},
      {"1", 1, "Nginx run in abnormal mode\n", 1},
      {"2", 2, "Nginx run in default mode\n", 1},
      {"3", -1, "Failed to get nginx mode\n", -1},
      {"10", -1, "Failed to get nginx mode\n", -1},
      {"", -1, "Failed to get nginx mode\n", -1},
  };
  for (const ModeCase& c : cases) {
    SCOPED_TRACE(c.record == nullptr ? "no record" : c.record);
    if (c.record != nullptr) WriteModeRecord(c.record);
    NginxConfManager manager(NGINXCONF_GET_MODE);
    EXPECT_EQ(c.mode, manager.run());
    EXPECT_EQ(c.msg, manager.GetMsg());
    EXPECT_EQ(c.is_default, TAVOServiceIsHttpDefaultConf());
  }
}

TEST(NginxConfOperator, SomeOperatorsStartEachRunWithAnEmptyMessage) {
  WriteModeRecord("0");
  struct Case {
    const char* name;
    NginxConfOperator* op;
    std::string one_run;
    bool clears;
  };
  NginxConfOperatorGetMode get_mode;
  NginxConfOperatorGenW3SC gen_sc;
  NginxConfOperatorIsForcedDefault is_forced;
  NginxConfOperatorClearVantoroProxy clear;
  const std::vector<Case> cases = {
      {"GetMode", &get_mode, "Nginx run in normal mode\n", true},
      {"GenW3SC", &gen_sc, "Generate tavow3.sc successfully\n", true},
      {"IsForcedDefault", &is_forced, "Nginx is not forced to default mode\n", false},
      {"ClearVantoroProxy", &clear, "Trust list of Vantoro servers is cleared.\n", false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    (void)c.op->run();
    (void)c.op->run();
    EXPECT_EQ(c.clears ? c.one_run : c.one_run + c.one_run, c.op->GetMsg());
  }
}

TEST(NginxConfManager, ForceDefaultCreatesTheFlagThatIsForcedDefaultReports) {
  RemoveTree("/run/tavow3");
  EXPECT_FALSE(NginxConfOperatorForceDefault::IsForced());
  NginxConfManager before(NGINXCONF_IS_FORCED_DEFAULT);
  EXPECT_EQ(0, before.run());
  EXPECT_EQ("Nginx is not forced to default mode\n", before.GetMsg());

  ClearLog();
  for (int round = 0; round < 2; ++round) {  // a second run touches the flag again
    SCOPED_TRACE(round);
    NginxConfManager force(NGINXCONF_FORCE_DEFAULT);
    EXPECT_EQ(0, force.run());
    EXPECT_EQ("", force.GetMsg());
    EXPECT_EQ("", ReadBytes(kForceDefaultFlag));
  }
  EXPECT_TRUE(TaggedLogMessages("nginx_deploy").empty());
  EXPECT_TRUE(NginxConfOperatorForceDefault().IsForced());
  NginxConfManager after(NGINXCONF_IS_FORCED_DEFAULT);
  EXPECT_EQ(1, after.run());
  EXPECT_EQ("Nginx is forced to default mode\n", after.GetMsg());
}

TEST(NginxConfManager, ForceDefaultFailuresAreLogged) {
  RemoveTree("/run/tavow3");
  WriteBytes("/run/tavow3", "not a directory");
  ClearLog();
  NginxConfManager no_dir(NGINXCONF_FORCE_DEFAULT);
  EXPECT_EQ(-1, no_dir.run());
  EXPECT_EQ("", no_dir.GetMsg());
  EXPECT_EQ(Lines{"nginx_deploy:1041 Faild to mkdir /run/tavow3"},
            TaggedLogMessages("nginx_deploy"));

  // A dangling link where the flag goes: it can be neither created nor seen.
  RemoveTree("/run/tavow3");
  ASSERT_EQ(0, RunCommand({"/bin/mkdir", "/run/tavow3"}).status);
  ASSERT_EQ(0, ::symlink("/nonexistent/flag", kForceDefaultFlag));
  ClearLog();
  NginxConfManager no_flag(NGINXCONF_FORCE_DEFAULT);
  EXPECT_EQ(-1, no_flag.run());
  EXPECT_EQ(Lines{"nginx_deploy:1045 Failed to create force default flag"},
            TaggedLogMessages("nginx_deploy"));
  EXPECT_FALSE(NginxConfOperatorForceDefault::IsForced());
}

}  // namespace
}  // namespace tavow3::test
