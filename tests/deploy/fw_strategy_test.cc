#include <tavow3/nginx_fw_strategy.h>

#include <limits.h>
#include <stdlib.h>
#include <unistd.h>

#include <algorithm>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "support/fake_tools.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::test {
namespace {

constexpr char kRule[] = "-A ZAM_DEFAULT_FORWARD -p tcp -m multiport --dports 5000,5001 -j ACCEPT";
constexpr char kHook[] = "-A INPUT -j ZAM_DEFAULT_FORWARD";
constexpr char kFailPatternFile[] = "/run/iptables-fail";

size_t CountRules(const std::string& wanted) {
  const std::vector<std::string> rules = IptablesRules();
  return std::count(rules.begin(), rules.end(), wanted);
}

// Whether any rule or chain mentions the emergency chain.
bool ChainIsGone() {
  for (const std::string& rule : IptablesRules()) {
    if (rule.find("ZAM_DEFAULT_FORWARD") != std::string::npos) return false;
  }
  return true;
}

// Puts a stand-in before the real iptables that fails (exit 1) every run
// whose arguments begin with the text in kFailPatternFile, and passes the
// others on. The library's own runs begin with the operation ("-A", "-F");
// the firewall library's begin with "-w -t filter".
void InterposeIptables() {
  char resolved[PATH_MAX];
  ASSERT_NE(nullptr, ::realpath("/usr/bin/iptables", resolved));
  std::string real = resolved;
  if (real == "/usr/bin/iptables") {
    real += ".real";
    ASSERT_EQ(0, ::rename("/usr/bin/iptables", real.c_str()));
  } else {
    ASSERT_EQ(0, ::unlink("/usr/bin/iptables"));
  }
  // A multi-call binary takes the tool's name as its first argument.
  const bool multi_call = real.find("multi") != std::string::npos;
  WriteBytes("/usr/bin/iptables",
              "#!/bin/sh\n"
              "pattern=$(cat " + std::string(kFailPatternFile) + " 2>/dev/null)\n"
              "if [ -n \"$pattern\" ]; then\n"
              "  case \"$*\" in \"$pattern\"*) exit 1 ;; esac\n"
              "fi\n"
              "exec " + real + (multi_call ? " iptables" : "") + " \"$@\"\n",
              0755);
}

void FailIptablesRunsStartingWith(const std::string& pattern) {
  WriteBytes(kFailPatternFile, pattern);
}

TEST(FwStrategyZAMDefault, AddsTheRuleOnce) {
  ASSERT_TRUE(ChainIsGone());
  FwStrategyZAMDefault strategy;
  EXPECT_TRUE(strategy.ApplyFirewallStrategy());
  EXPECT_EQ(1u, CountRules(kRule));
  EXPECT_EQ(1u, CountRules(kHook));
  // The loaded module set counts as the rule being in place.
  EXPECT_TRUE(FwStrategyZAMDefault().ApplyFirewallStrategy());
  EXPECT_EQ(1u, CountRules(kRule));
  EXPECT_EQ(1u, CountRules(kHook));
  EXPECT_TRUE(FakeCalls("tavofirewall").empty());
}

TEST(FwStrategyClear, ReloadsFlushesAndUnhooks) {
  ASSERT_TRUE(FwStrategyZAMDefault().ApplyFirewallStrategy());
  ASSERT_EQ(1u, CountRules(kRule));
  ClearLog();
  EXPECT_TRUE(FwStrategyClear().ApplyFirewallStrategy());
  EXPECT_TRUE(ChainIsGone());
  EXPECT_EQ(std::vector<std::vector<std::string>>{{"--reload"}}, FakeCalls("tavofirewall"));
  EXPECT_TRUE(TaggedLogMessages("nginx_deploy").empty());

  // Nothing loaded: only the reload runs, and its result decides.
  EXPECT_TRUE(FwStrategyClear().ApplyFirewallStrategy());
  EXPECT_EQ(2u, FakeCalls("tavofirewall").size());
  SetFakeExit("tavofirewall", 3);
  EXPECT_FALSE(FwStrategyClear().ApplyFirewallStrategy());
  EXPECT_EQ(std::vector<std::string>{"nginx_deploy:398 Failed to reload tavofirewall"},
            TaggedLogMessages("nginx_deploy"));
  EXPECT_TRUE(ChainIsGone());
}

TEST(FwStrategyClear, FailingReloadStillFlushesAndUnloads) {
  ASSERT_TRUE(FwStrategyZAMDefault().ApplyFirewallStrategy());
  SetFakeExit("tavofirewall", 1);
  ClearLog();
  EXPECT_FALSE(FwStrategyClear().ApplyFirewallStrategy());
  EXPECT_EQ(std::vector<std::string>{"nginx_deploy:398 Failed to reload tavofirewall"},
            TaggedLogMessages("nginx_deploy"));
  EXPECT_EQ(1u, FakeCalls("tavofirewall").size());
  EXPECT_TRUE(ChainIsGone());
}

TEST(NginxFwStrategy, IptablesFailuresAreLoggedAndReported) {
  InterposeIptables();
  const struct {
    const char* name;
    bool preload;         // the Default rule is in place first
    bool clear;           // FwStrategyClear, else FwStrategyZAMDefault
    const char* failing;  // start of the failing iptables runs
    bool result;
    std::vector<std::string> log;
    bool chain_gone;
  } cases[] = {
      {"load", false, false, "-w -t filter -N", false,
       {"nginx_deploy:418 Failed to load iptable core module"}, true},
      {"rule", false, false, "-A ZAM_DEFAULT_FORWARD", false,
       {"nginx_deploy:425 Failed to set default iptable rules"}, false},
      {"flush", true, true, "-F ZAM_DEFAULT_FORWARD", false,
       {"nginx_deploy:404 Failed to clear iptable rules"}, true},
      // Last: the chain it leaves behind is no longer hooked, so not "loaded".
      {"unload", true, true, "-w -t filter -X", true,
       {"nginx_deploy:409 Failed to unload iptable core module"}, false},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    FailIptablesRunsStartingWith("");
    ASSERT_TRUE(FwStrategyClear().ApplyFirewallStrategy());
    ASSERT_TRUE(ChainIsGone());
    if (c.preload) {
      ASSERT_TRUE(FwStrategyZAMDefault().ApplyFirewallStrategy());
    }
    FailIptablesRunsStartingWith(c.failing);
    ClearLog();
    if (c.clear) {
      EXPECT_EQ(c.result, FwStrategyClear().ApplyFirewallStrategy());
    } else {
      EXPECT_EQ(c.result, FwStrategyZAMDefault().ApplyFirewallStrategy());
    }
    EXPECT_EQ(c.log, TaggedLogMessages("nginx_deploy"));
    FailIptablesRunsStartingWith("");
    EXPECT_EQ(c.chain_gone, ChainIsGone());
    EXPECT_EQ(0u, CountRules(kRule));
  }
}

}  // namespace
}  // namespace tavow3::test
