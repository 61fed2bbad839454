#include "tavo/firewall.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <string>
#include <vector>

#include "support/test_process.h"

namespace {

using tavow3::test::IptablesRules;

constexpr char kSet[] = "ZAM_DEFAULT_SERVICE";

int Count(const std::vector<std::string>& rules, const std::string& rule) {
  return static_cast<int>(std::count(rules.begin(), rules.end(), rule));
}

void Iptables(const std::string& args) {
  std::string command = "/usr/bin/iptables -w " + args;
  ASSERT_EQ(0, ::system(command.c_str())) << command;
}

class FirewallModules : public testing::Test {
 protected:
  void SetUp() override { ASSERT_EQ(0, Count(IptablesRules(), "-N ZAM_DEFAULT_FORWARD")); }
  FW::TAVO_IPTABLES_MODULES modules_;
};

TEST_F(FirewallModules, LoadCreatesChainAndFirstJumpOnce) {
  Iptables("-A INPUT -p udp --dport 9 -j ACCEPT");
  EXPECT_FALSE(modules_.isModuleLoad(kSet));
  EXPECT_TRUE(modules_.iptablesCoreModLoad(kSet));
  EXPECT_TRUE(modules_.isModuleLoad(kSet));
  EXPECT_TRUE(modules_.iptablesCoreModLoad(kSet));
  std::vector<std::string> rules = IptablesRules();
  EXPECT_EQ(1, Count(rules, "-N ZAM_DEFAULT_FORWARD"));
  EXPECT_EQ(1, Count(rules, "-A INPUT -j ZAM_DEFAULT_FORWARD"));
  std::vector<std::string> input;
  for (const std::string& rule : rules) {
    if (rule.rfind("-A INPUT ", 0) == 0) input.push_back(rule);
  }
  ASSERT_EQ(2u, input.size());
  EXPECT_EQ("-A INPUT -j ZAM_DEFAULT_FORWARD", input[0]);
}

TEST_F(FirewallModules, LoadCompletesAHalfLoadedSet) {
  Iptables("-N ZAM_DEFAULT_FORWARD");
  Iptables("-A ZAM_DEFAULT_FORWARD -p tcp --dport 5000 -j ACCEPT");
  EXPECT_FALSE(modules_.isModuleLoad(kSet));  // chain without the jump
  EXPECT_TRUE(modules_.iptablesCoreModLoad(kSet));
  EXPECT_TRUE(modules_.isModuleLoad(kSet));
  EXPECT_EQ(1, Count(IptablesRules(), "-A ZAM_DEFAULT_FORWARD -p tcp -m tcp --dport 5000 -j ACCEPT"));
}

TEST_F(FirewallModules, UnloadRemovesJumpsRulesAndChain) {
  ASSERT_TRUE(modules_.iptablesCoreModLoad(kSet));
  Iptables("-A INPUT -j ZAM_DEFAULT_FORWARD");  // a second jump
  Iptables("-A ZAM_DEFAULT_FORWARD -p tcp -m multiport --dports 5000,5001 "
      "-j ACCEPT");
  EXPECT_TRUE(modules_.iptablesCoreModUnload(kSet));
  EXPECT_FALSE(modules_.isModuleLoad(kSet));
  std::vector<std::string> rules = IptablesRules();
  for (const std::string& rule : rules) EXPECT_EQ(std::string::npos, rule.find("ZAM_DEFAULT"));
  EXPECT_TRUE(modules_.iptablesCoreModUnload(kSet));  // nothing loaded: still success
  EXPECT_EQ(rules, IptablesRules());
}

TEST_F(FirewallModules, UnknownSetAndMissingIptablesFail) {
  EXPECT_FALSE(modules_.iptablesCoreModLoad("OTHER_SERVICE"));
  EXPECT_FALSE(modules_.iptablesCoreModUnload("OTHER_SERVICE"));
  EXPECT_FALSE(modules_.isModuleLoad("OTHER_SERVICE"));
  EXPECT_EQ(0, Count(IptablesRules(), "-N ZAM_DEFAULT_FORWARD"));

  ASSERT_TRUE(modules_.iptablesCoreModLoad(kSet));
  ASSERT_EQ(0, ::rename("/usr/bin/iptables", "/usr/bin/iptables.away"));
  EXPECT_FALSE(modules_.isModuleLoad(kSet));
  EXPECT_FALSE(modules_.iptablesCoreModLoad(kSet));
  EXPECT_FALSE(modules_.iptablesCoreModUnload(kSet));
  ASSERT_EQ(0, ::rename("/usr/bin/iptables.away", "/usr/bin/iptables"));
  EXPECT_TRUE(modules_.isModuleLoad(kSet));
}

}  // namespace
