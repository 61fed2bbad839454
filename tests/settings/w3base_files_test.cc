// The settings-file primitives against real files, real mounts and the fault hook.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <tavow3/w3base.h>

#include "base/fault.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"
#include "support/test_mounts.h"
#include "support/test_process.h"

namespace tavow3 {
namespace {

using test::DirNames;
using test::HasLogMatching;
using test::LogMessages;
using test::MustRun;
using test::ParseJson;
using test::PathExists;
using test::ReadBytes;
using test::RemoveTree;
using test::WriteBytes;
namespace fault = base::fault;

constexpr char kDir[] = "/var/tmp/w3base";
constexpr char kFile[] = "/var/tmp/w3base/settings.json";

// True when `dir` holds a name starting with `prefix` (a temporary beside a file).
bool HasTemporary(const std::string& dir, const std::string& prefix) {
  for (const std::string& name : DirNames(dir)) {
    if (name.compare(0, prefix.size(), prefix) == 0) return true;
  }
  return false;
}

TEST(ReadJsonFile, MissingEmptyBrokenAndGoodFiles) {
  struct Case {
    const char* name;
    const char* content;  // null: no file
    bool allow_missing;
    bool result;
    const char* log;      // regular expression of the one line expected, or null
  };
  const Case cases[] = {
      {"missing allowed", nullptr, true, true, nullptr},
      {"missing refused", nullptr, false, false,
       "tavow3\\.cpp:\\d+ Fail to fopen file \\(/var/tmp/w3base/settings\\.json, No such file or directory\\)"},
      {"empty allowed", "", true, true, nullptr},
      {"empty refused", "", false, false,
       "tavow3\\.cpp:\\d+ File \\[/var/tmp/w3base/settings\\.json\\] cannont be empty!"},
      {"blank allowed", " \n\t \n", true, true, nullptr},
      {"blank refused", " \n\t \n", false, false,
       "tavow3\\.cpp:\\d+ File \\[/var/tmp/w3base/settings\\.json\\] cannont be empty!"},
      {"broken", "{\"a\": ", true, false,
       "tavow3\\.cpp:\\d+ File \\[/var/tmp/w3base/settings\\.json\\] formate is wrong!"},
      {"good", "{\"a\": 1}", false, true, nullptr},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    RemoveTree(kDir);
    if (c.content != nullptr) WriteBytes(kFile, c.content);
    test::ClearLog();
    Json::Value out("untouched");
    EXPECT_EQ(c.result, W3Base::ReadJsonFile(kFile, out, c.allow_missing));
    const std::vector<std::string> log = LogMessages();
    if (c.log != nullptr) {
      EXPECT_EQ(1u, log.size());
      EXPECT_TRUE(HasLogMatching(log, c.log)) << (log.empty() ? "" : log[0]);
    } else {
      EXPECT_TRUE(log.empty()) << log[0];
    }
    if (c.result && c.content != nullptr && std::string(c.content).find('{') != std::string::npos) {
      EXPECT_EQ(ParseJson(c.content), out);
    } else {
      EXPECT_EQ(Json::Value("untouched"), out);
    }
  }
  Json::Value out;
  EXPECT_FALSE(W3Base::ReadJsonFile("", out, true));
  EXPECT_TRUE(HasLogMatching(LogMessages(), "tavow3\\.cpp:\\d+ No json file name given to read!"));
}

TEST(WriteJsonFile, CreatesParentsAndSetsOwnerAndMode) {
  const std::string path = "/var/tmp/w3base/a/b/settings.json";
  RemoveTree(kDir);
  Json::Value value;
  value["port"] = 5001;
  ASSERT_TRUE(W3Base::WriteJsonFile(path, value));
  EXPECT_EQ(value, ParseJson(ReadBytes(path)));
  for (const std::string& dir : {std::string(kDir), std::string(kDir) + "/a", std::string(kDir) + "/a/b"}) {
    SCOPED_TRACE(dir);
    struct stat st;
    ASSERT_EQ(0, ::stat(dir.c_str(), &st));
    EXPECT_EQ(0755u, st.st_mode & 07777);
    EXPECT_EQ(1u, st.st_uid);
    EXPECT_EQ(1u, st.st_gid);
  }
  struct stat st;
  ASSERT_EQ(0, ::stat(path.c_str(), &st));
  EXPECT_EQ(0644u, st.st_mode & 07777);
  EXPECT_EQ(1u, st.st_uid);
  EXPECT_EQ(1u, st.st_gid);
  EXPECT_EQ(std::vector<std::string>{"settings.json"}, DirNames(std::string(kDir) + "/a/b"));

  EXPECT_FALSE(W3Base::WriteJsonFile("", value));
  EXPECT_TRUE(HasLogMatching(LogMessages(), "tavow3\\.cpp:\\d+ No json file name given to write!"));
}

// Every file call of a write fails in turn, once and from then on: the stored
// file is the old or the complete new one, a failure always leaves the old one,
// and a single fault leaves no temporary file behind.
TEST(WriteJsonFile, FailureAtEveryFileCallKeepsOldOrNewBytes) {
  Json::Value value;
  value["new"] = true;
  const std::string new_bytes = value.toStyledString();
  for (fault::Mode mode : {fault::kOnce, fault::kPersistent}) {
    int n = 1;
    int failures = 0;
    for (;; ++n) {
      SCOPED_TRACE(testing::Message() << "mode " << mode << ", call " << n);
      RemoveTree(kDir);
      WriteBytes(kFile, "old");
      bool ok;
      bool fired;
      {
        fault::Arm arm(n, mode, EIO);
        ok = W3Base::WriteJsonFile(kFile, value);
        fired = arm.fired();
      }
      if (!fired) {
        EXPECT_TRUE(ok);
        break;
      }
      const std::string bytes = ReadBytes(kFile);
      if (!ok) {
        ++failures;
        EXPECT_EQ("old", bytes);
      } else {
        EXPECT_TRUE(bytes == "old" || ParseJson(bytes) == value) << bytes;
      }
      if (mode == fault::kOnce) {
        EXPECT_FALSE(HasTemporary(kDir, "settings.json."));
      }
    }
    EXPECT_GE(n - 1, 6);        // mkstemp, open, write, chown, chmod, close, rename ...
    EXPECT_GE(failures, 4);     // open, write, chown, chmod at least fail the write
  }
}

TEST(WriteJsonFile, FullFileSystemIsCaughtBeforeTheRename) {
  const std::string dir = "/var/tmp/full";
  ASSERT_TRUE(test::MountTmpfs(dir, "size=64k"));
  const std::string path = dir + "/settings.json";
  WriteBytes(path, "{\"old\": true}");
  // Fill the file system up to the last block.
  std::vector<std::string> dd = {"/bin/dd", "if=/dev/zero", "of=" + dir + "/filler", "bs=4k"};
  (void)test::RunCommand(dd);
  Json::Value value;
  value["blob"] = std::string(32 * 1024, 'x');
  test::ClearLog();
  EXPECT_FALSE(W3Base::WriteJsonFile(path, value));
  EXPECT_EQ("{\"old\": true}", ReadBytes(path));
  EXPECT_EQ((std::vector<std::string>{"filler", "settings.json"}), DirNames(dir));
  EXPECT_TRUE(HasLogMatching(LogMessages(),
                             "tavow3\\.cpp:\\d+ Fail to write file \\(/var/tmp/full/settings\\.json\\.\\w{6}, "
                             "No space left on device\\)"));
}

TEST(MoveFile, MissingSourceUnreplaceableTargetAndSuccess) {
  test::FreshDir(kDir);
  const std::string from = std::string(kDir) + "/staged.json";
  const std::string to = std::string(kDir) + "/out/stored.json";

  test::ClearLog();
  EXPECT_FALSE(W3Base::MoveFile(from, to));
  EXPECT_TRUE(HasLogMatching(LogMessages(), "tavow3\\.cpp:\\d+ Cannot open file /var/tmp/w3base/staged\\.json"));
  EXPECT_TRUE(DirNames(std::string(kDir) + "/out").empty());

  // A non-empty directory where the file must go: the rename fails, the move
  // still reports success and the staged file is gone.
  WriteBytes(from, "staged");
  WriteBytes(to + "/inner", "x");
  test::ClearLog();
  EXPECT_TRUE(W3Base::MoveFile(from, to));
  EXPECT_FALSE(PathExists(from));
  EXPECT_TRUE(HasLogMatching(LogMessages(),
                             "tavow3\\.cpp:\\d+ Fail to rename file from /var/tmp/w3base/out/stored\\.json\\.\\w{6} "
                             "to /var/tmp/w3base/out/stored\\.json, Is a directory"));
  EXPECT_EQ(std::vector<std::string>{"stored.json"}, DirNames(std::string(kDir) + "/out"));

  RemoveTree(to);
  WriteBytes(from, "staged bytes");
  ASSERT_EQ(0, ::chmod(from.c_str(), 0600));
  EXPECT_TRUE(W3Base::MoveFile(from, to));
  EXPECT_EQ("staged bytes", ReadBytes(to));
  EXPECT_FALSE(PathExists(from));
  struct stat st;
  ASSERT_EQ(0, ::stat(to.c_str(), &st));
  EXPECT_EQ(0644u, st.st_mode & 07777);
}

TEST(MoveFile, FailureAtEveryFileCallDeletesTheSourceAndKeepsTheTarget) {
  const std::string from = std::string(kDir) + "/staged.json";
  for (fault::Mode mode : {fault::kOnce, fault::kPersistent}) {
    int n = 1;
    for (;; ++n) {
      SCOPED_TRACE(testing::Message() << "mode " << mode << ", call " << n);
      RemoveTree(kDir);
      WriteBytes(kFile, "old");
      WriteBytes(from, "new");
      bool ok;
      bool fired;
      {
        fault::Arm arm(n, mode, EIO);
        ok = W3Base::MoveFile(from, kFile);
        fired = arm.fired();
      }
      if (!fired) {
        EXPECT_TRUE(ok);
        EXPECT_EQ("new", ReadBytes(kFile));
        break;
      }
      const std::string bytes = ReadBytes(kFile);
      EXPECT_TRUE(ok ? (bytes == "new" || bytes == "old") : bytes == "old") << bytes;
      if (mode == fault::kOnce) {
        EXPECT_FALSE(HasTemporary(kDir, "settings.json."));
      }
    }
    EXPECT_GE(n - 1, 7);  // mkstemp, open x2, read, write, close, chmod, rename, unlink
  }
}

TEST(MakeParentFolderExist, RefusalsAndReadOnlyFileSystem) {
  test::ClearLog();
  EXPECT_FALSE(W3Base::MakeParentFolderExist(""));
  EXPECT_FALSE(W3Base::MakeParentFolderExist("settings.json"));
  std::vector<std::string> log = LogMessages();
  EXPECT_TRUE(HasLogMatching(log, "tavow3\\.cpp:\\d+ No path found"));
  EXPECT_TRUE(HasLogMatching(log, "tavow3\\.cpp:\\d+ No parent folder found"));

  test::MakeDirs("/var/tmp/ro");
  MustRun({"/bin/mount", "-t", "tmpfs", "-o", "ro,size=16k", "tmpfs", "/var/tmp/ro"});
  test::ClearLog();
  EXPECT_FALSE(W3Base::MakeParentFolderExist("/var/tmp/ro/a/b/settings.json"));
  EXPECT_TRUE(HasLogMatching(LogMessages(),
                             "tavow3\\.cpp:\\d+ make directory exist failed \\(/var/tmp/ro/a/b, "
                             "Read-only file system\\)"));
}

}  // namespace
}  // namespace tavow3
