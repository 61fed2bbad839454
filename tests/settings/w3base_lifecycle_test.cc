// Get, the locked Save and Set of the settings base, through a small subclass.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/wait.h>
#include <unistd.h>

#include <stdexcept>

#include <tavow3/engine.h>
#include <tavow3/w3base.h>

#include "engine/engine_private.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3 {
namespace {

using test::CanFlock;
using test::HasLogMatching;
using test::LogMessages;
using test::MustRun;
using test::ReadBytes;
using test::WriteBytes;

constexpr char kProbeFile[] = "/usr/tavo/etc/www/Probe.json";
constexpr char kLockFile[] = "/run/lock/tavow3.lock";

// A settings object with one integer, stored through the base's locked save.
class Probe : public W3Base {
 public:
  explicit Probe(Engine engine) : W3Base(std::move(engine)) { Get(); }

  void DataInit() override {
    value = 7;
    SetDirty(false);
    SetOK(false);
  }
  bool GetJson(Json::Value& json) override { return ReadJsonFile(kProbeFile, json, false); }
  bool SetJson(Json::Value& json) override {
    if (on_write) on_write();
    return WriteJsonFile(kProbeFile, json);
  }
  void TransJsonToVar(Json::Value& json) override {
    if (json["value"].isInt()) value = json["value"].asInt();
  }
  bool TransVarToJson(Json::Value& json) override {
    if (throw_on_build) throw std::runtime_error("probe");
    json["value"] = value;
    return true;
  }

  int value = 0;
  bool throw_on_build = false;
  std::function<void()> on_write;
};

TEST(W3BaseGet, StoredValuesDefaultsAndBrokenFiles) {
  Engine engine;
  struct Case {
    const char* name;
    const char* content;
    bool result;
    int value;
  };
  const Case cases[] = {
      {"stored", "{\"value\": 42}", true, 42},
      {"mistyped key keeps default", "{\"value\": \"42\"}", true, 7},
      {"absent key keeps default", "{\"other\": 1}", true, 7},
      {"broken", "{\"value\": 4", false, 7},
      {"empty", "", false, 7},
      {"missing", nullptr, false, 7},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    test::RemoveTree(kProbeFile);
    if (c.content != nullptr) WriteBytes(kProbeFile, c.content);
    Probe probe(engine);
    probe.value = 99;
    EXPECT_EQ(c.result, probe.Get());
    EXPECT_EQ(c.result, probe.OK());
    EXPECT_EQ(c.value, probe.value);
  }
}

TEST(W3BaseGet, NoLockFileMeansDefaultsAndNoSaving) {
  WriteBytes(kProbeFile, "{\"value\": 42}");
  // Root ignores permission bits: a read-only mount keeps the lock file from being created.
  MustRun({"/bin/mount", "-t", "tmpfs", "-o", "ro,size=16k", "tmpfs", "/run/lock"});
  test::ClearLog();
  Engine engine;
  ASSERT_EQ(-1, engine.impl().lock_fd);
  Probe probe(engine);
  EXPECT_FALSE(probe.OK());
  EXPECT_EQ(7, probe.value);
  probe.value = 8;
  EXPECT_FALSE(probe.Save());
  EXPECT_FALSE(probe.Set());
  const std::vector<std::string> log = LogMessages();
  EXPECT_TRUE(HasLogMatching(log, "tavow3\\.cpp:\\d+ libtavow3 failed on read file lock, default value used\\."));
  EXPECT_TRUE(HasLogMatching(log, "tavow3\\.cpp:\\d+ libtavow3 failed on read file lock, cancel saving\\."));
  EXPECT_EQ("{\"value\": 42}", ReadBytes(kProbeFile));
}

TEST(W3BaseSave, HoldsTheLockExclusiveOnlyWhileWritingAndSharedAfterAnException) {
  Engine engine;
  Probe probe(engine);
  ASSERT_TRUE(CanFlock(kLockFile, LOCK_SH));
  ASSERT_FALSE(CanFlock(kLockFile, LOCK_EX));  // the engine's shared lock

  bool shared_during_write = true;
  probe.on_write = [&] { shared_during_write = CanFlock(kLockFile, LOCK_SH); };
  probe.value = 11;
  EXPECT_TRUE(probe.Save());
  EXPECT_FALSE(shared_during_write);
  EXPECT_TRUE(CanFlock(kLockFile, LOCK_SH));
  EXPECT_EQ(11, Probe(engine).value);

  probe.on_write = nullptr;
  probe.throw_on_build = true;
  EXPECT_THROW(probe.Save(), std::runtime_error);
  EXPECT_TRUE(CanFlock(kLockFile, LOCK_SH));
  EXPECT_FALSE(CanFlock(kLockFile, LOCK_EX));
  EXPECT_GE(engine.impl().lock_fd, 0);
}

TEST(W3BaseSave, TwoProcessesSavingAtOnceAreSerialised) {
  int in_write[2];
  int release[2];
  ASSERT_EQ(0, ::pipe(in_write));
  ASSERT_EQ(0, ::pipe(release));
  const pid_t first = ::fork();
  ASSERT_GE(first, 0);
  if (first == 0) {
    Engine engine;
    Probe probe(engine);
    probe.value = 1;
    probe.on_write = [&] {
      char c = 'w';
      (void)!::write(in_write[1], &c, 1);
      (void)!::read(release[0], &c, 1);
    };
    _exit(probe.Save() ? 0 : 1);
  }
  char c;
  ASSERT_EQ(1, ::read(in_write[0], &c, 1));  // the first process writes under its lock

  const pid_t second = ::fork();
  ASSERT_GE(second, 0);
  if (second == 0) {
    Engine engine;
    Probe probe(engine);
    probe.value = 2;
    _exit(probe.Save() ? 0 : 1);
  }
  // The second process must be waiting for the exclusive lock, not writing.
  EXPECT_TRUE(test::WaitUntil([&] { return test::IsWaitingForFlock(second); }));
  EXPECT_EQ("<missing>", ReadBytes(kProbeFile));

  ASSERT_EQ(1, ::write(release[1], "r", 1));
  int status;
  ASSERT_EQ(first, ::waitpid(first, &status, 0));
  EXPECT_EQ(0, WEXITSTATUS(status));
  ASSERT_EQ(second, ::waitpid(second, &status, 0));
  EXPECT_EQ(0, WEXITSTATUS(status));
  std::string bytes = ReadBytes(kProbeFile);
  EXPECT_NE(std::string::npos, bytes.find("\"value\" : 2")) << bytes;
}

TEST(W3BaseSet, RestartsOnlyAfterASuccessfulSave) {
  // A stand-in control script records each reload.
  WriteBytes("/usr/tavo/etc/rc.sysv/nginx.sh", "#!/bin/sh\necho \"$1\" >> /run/nginx-script.log\n",
             0755);
  Engine engine;
  Probe probe(engine);
  probe.value = 3;
  EXPECT_TRUE(probe.Set());
  EXPECT_EQ("reload\n", ReadBytes("/run/nginx-script.log"));

  probe.on_write = [] { MustRun({"/bin/mount", "-t", "tmpfs", "-o", "ro,size=16k", "tmpfs", "/usr/tavo/etc/www"}); };
  EXPECT_FALSE(probe.Set());
  EXPECT_EQ("reload\n", ReadBytes("/run/nginx-script.log"));
}

}  // namespace
}  // namespace tavow3
