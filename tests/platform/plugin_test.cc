#include "tavo/tlib_plugin.h"

#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "support/test_files.h"

namespace {

using tavow3::test::FreshDir;
using tavow3::test::Lines;
using tavow3::test::ReadBytes;
using tavow3::test::WriteBytes;

constexpr char kLog[] = "/tmp/hooks.log";

struct PluginCloser {
  void operator()(TLIB_PLUGIN* plugin) const { TLIBPluginExit(plugin); }
};
using Plugin = std::unique_ptr<TLIB_PLUGIN, PluginCloser>;

std::string HookPath(const std::string& package) {
  return "/var/packages/" + package + "/target/hooks/app_portal/app_portal_set";
}

// A hook that logs its package, argument and hook environment, then runs `tail`.
void WriteHook(const std::string& package, const std::string& tail, mode_t mode = 0755) {
  WriteBytes(HookPath(package),
             "#!/bin/sh\necho \"" + package +
                 " $# $1 name=$TAVO_NAME result=$TAVO_RESULT empty=${TAVO_EMPTY-unset} "
                 "keep=${KEEP_ME-unset} names=$(tr '\\0' '\\n' < /proc/$$/environ | grep -c ^TAVO_NAME=)\" >> /tmp/hooks.log\n" + tail,
             mode);
}

class TLIBPlugin : public testing::Test {
 protected:
  void SetUp() override {
    std::filesystem::remove_all("/var/packages");
    ::unlink(kLog);
  }
};

TEST_F(TLIBPlugin, RunsEveryPackageHookInNameOrderWithArguments) {
  WriteHook("beta", "exit 0\n");
  WriteHook("alpha", "exit 0\n");
  FreshDir("/var/packages/gamma/target/hooks/app_portal");  // no hook of that name
  WriteHook("delta", "exit 0\n");
  // A package target is often a link to where the package is stored.
  std::filesystem::rename("/var/packages/delta/target", "/var/packages/delta/stored");
  std::filesystem::create_symlink("stored", "/var/packages/delta/target");
  ::setenv("TAVO_NAME", "stale", 1);
  ::setenv("KEEP_ME", "kept", 1);

  Plugin plugin(TLIBPluginSDKInit("app_portal", "app_portal_set"));
  ASSERT_NE(nullptr, plugin);
  EXPECT_EQ(0, TLIBPluginSetArg(plugin.get(), "NAME", "first"));
  EXPECT_EQ(0, TLIBPluginSetArg(plugin.get(), "NAME", "my portal"));
  EXPECT_EQ(0, TLIBPluginSetArg(plugin.get(), "EMPTY", ""));
  EXPECT_EQ(0, TLIBPluginSetArgByInt(plugin.get(), "RESULT", -1));
  EXPECT_EQ(0, TLIBPluginAction(plugin.get(), 4));
  ::unsetenv("TAVO_NAME");
  ::unsetenv("KEEP_ME");
  EXPECT_EQ((std::vector<std::string>{
                "alpha 1 4 name=my portal result=-1 empty= keep=kept names=1",
                "beta 1 4 name=my portal result=-1 empty= keep=kept names=1",
                "delta 1 4 name=my portal result=-1 empty= keep=kept names=1",
            }),
            Lines(ReadBytes(kLog)));
}

TEST_F(TLIBPlugin, ResultIsTheFirstFailureAndLaterHooksStillRun) {
  struct Case {
    const char* alpha_tail;
    mode_t alpha_mode;
    const char* beta_tail;
    int result;
  } cases[] = {
      {"exit 0\n", 0755, "exit 0\n", 0},
      {"exit 3\n", 0755, "exit 5\n", 3},
      {"exit 0\n", 0755, "exit 5\n", 5},
      {"kill -KILL $$\n", 0755, "exit 5\n", -1},
      {"exit 0\n", 0644, "exit 0\n", -1},  // not executable: it cannot run
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(testing::Message() << c.alpha_tail << c.alpha_mode << " " << c.beta_tail);
    ::unlink(kLog);
    WriteHook("alpha", c.alpha_tail, c.alpha_mode);
    WriteHook("beta", c.beta_tail);
    Plugin plugin(TLIBPluginSDKInit("app_portal", "app_portal_set"));
    EXPECT_EQ(c.result, TLIBPluginAction(plugin.get(), 5));
    std::vector<std::string> log = Lines(ReadBytes(kLog));
    ASSERT_FALSE(log.empty());
    EXPECT_EQ(0u, log.back().rfind("beta 1 5 ", 0));
  }
}

TEST_F(TLIBPlugin, NoPackagesMeansSuccess) {
  Plugin plugin(TLIBPluginSDKInit("app_portal", "app_portal_set"));
  EXPECT_EQ(0, TLIBPluginAction(plugin.get(), 4));
  FreshDir("/var/packages");
  EXPECT_EQ(0, TLIBPluginAction(plugin.get(), 4));
  EXPECT_EQ("<missing>", ReadBytes(kLog));
}

TEST_F(TLIBPlugin, RefusesBadNamesAndKeys) {
  for (const char* name : {static_cast<const char*>(nullptr), "", "..", "a/b"}) {
    SCOPED_TRACE(name ? name : "(null)");
    errno = 0;
    EXPECT_EQ(nullptr, TLIBPluginSDKInit("app_portal", name));
    EXPECT_EQ(EINVAL, errno);
    errno = 0;
    EXPECT_EQ(nullptr, TLIBPluginSDKInit(name, "app_portal_set"));
    EXPECT_EQ(EINVAL, errno);
  }
  Plugin plugin(TLIBPluginSDKInit("app_portal", "app_portal_set"));
  for (const char* key : {static_cast<const char*>(nullptr), "", "BAD-KEY", "A B", "A=B"}) {
    SCOPED_TRACE(key ? key : "(null)");
    errno = 0;
    EXPECT_EQ(-1, TLIBPluginSetArg(plugin.get(), key, "v"));
    EXPECT_EQ(EINVAL, errno);
    EXPECT_EQ(-1, TLIBPluginSetArgByInt(plugin.get(), key, 1));
  }
  EXPECT_EQ(-1, TLIBPluginSetArg(plugin.get(), "KEY", nullptr));
  EXPECT_EQ(-1, TLIBPluginSetArg(nullptr, "KEY", "v"));
  EXPECT_EQ(-1, TLIBPluginAction(nullptr, 4));
  TLIBPluginExit(nullptr);
}

}  // namespace
