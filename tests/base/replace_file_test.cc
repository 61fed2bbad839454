#include <sys/stat.h>

#include <cerrno>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "base/fault.h"
#include "base/file_io.h"
#include "support/test_files.h"
#include "support/test_mounts.h"

namespace tavow3::base {
namespace {

using test::FreshDir;
using test::DirNames;
using test::ReadBytes;
using test::WriteBytes;

constexpr char kDir[] = "/tmp/replace";
constexpr char kPath[] = "/tmp/replace/settings.json";
const FileMode kMode = {1, 1, 0644};

// Removes what a persistent fault left behind (its unlink failed too).
void KeepOnly(const std::string& dir, const std::string& name) {
  for (const std::string& entry : DirNames(dir)) {
    if (entry != name) std::remove((dir + "/" + entry).c_str());
  }
}

TEST(ReplaceFile, FailureAtEveryFileCallKeepsOldBytes) {
  for (fault::Mode mode : {fault::kOnce, fault::kPersistent}) {
    FreshDir(kDir);
    WriteBytes(kPath, "old");
    int n = 1;
    for (;; ++n) {
      SCOPED_TRACE(testing::Message() << "mode " << mode << ", call " << n);
      bool ok;
      bool fired;
      {
        fault::Arm arm(n, mode, EIO);
        errno = 0;
        ok = ReplaceFile(kPath, "new", kMode);
        fired = arm.fired();
        if (fired) {
          EXPECT_EQ(EIO, errno);
        }
      }
      if (!fired) {
        EXPECT_TRUE(ok);
        EXPECT_EQ("new", ReadBytes(kPath));
        break;
      }
      EXPECT_FALSE(ok);
      EXPECT_EQ("old", ReadBytes(kPath));
      if (mode == fault::kOnce) {
        EXPECT_EQ(std::vector<std::string>{"settings.json"}, DirNames(kDir));
      }
      KeepOnly(kDir, "settings.json");
      ASSERT_LT(n, 50) << "the operation never completed";
    }
    // mkstemp, write, fchown, fchmod, fsync, close, rename.
    EXPECT_GE(n - 1, 7);
  }
}

TEST(ReplaceFile, WritesBytesOwnerAndMode) {
  FreshDir(kDir);
  struct Case {
    std::string bytes;
    FileMode mode;
  };
  const std::string big(1024 * 1024 + 17, 'x');
  const std::vector<Case> cases = {
      {"", {1, 1, 0644}},
      {"{\"a\": 1}\n", {0, 0, 0600}},
      {big, {1, 1, 0644}},
      {std::string("nul\0inside", 10), {2, 3, 04755}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(testing::Message() << c.bytes.size() << " bytes, mode " << std::oct
                                    << c.mode.mode);
    ASSERT_TRUE(ReplaceFile(kPath, c.bytes, c.mode)) << strerror(errno);
    EXPECT_EQ(c.bytes, ReadBytes(kPath));
    struct stat st;
    ASSERT_EQ(0, ::stat(kPath, &st));
    EXPECT_EQ(c.mode.uid, st.st_uid);
    EXPECT_EQ(c.mode.gid, st.st_gid);
    EXPECT_EQ(c.mode.mode, st.st_mode & 07777);
    EXPECT_EQ(std::vector<std::string>{"settings.json"}, DirNames(kDir));
  }
}

TEST(ReplaceFile, FullFileSystemFailsBeforeRename) {
  FreshDir(kDir);
  const test::ScopedMount mount = test::ScopedMount::Tmpfs(kDir, "size=64k");
  ASSERT_TRUE(mount.ok()) << strerror(errno);
  const std::string old_bytes(1000, 'o');
  WriteBytes(kPath, old_bytes);
  ASSERT_EQ(old_bytes, ReadBytes(kPath));

  errno = 0;
  EXPECT_FALSE(ReplaceFile(kPath, std::string(128 * 1024, 'n'), kMode));
  EXPECT_EQ(ENOSPC, errno);
  EXPECT_EQ(old_bytes, ReadBytes(kPath));
  EXPECT_EQ(std::vector<std::string>{"settings.json"}, DirNames(kDir));

  // What fits still goes through on the same file system.
  EXPECT_TRUE(ReplaceFile(kPath, std::string(16 * 1024, 'n'), kMode)) << strerror(errno);
  EXPECT_EQ(std::string(16 * 1024, 'n'), ReadBytes(kPath));
}

TEST(ReplaceFile, ReadOnlyOrMissingDirectoryFails) {
  FreshDir(kDir);
  WriteBytes(kPath, "old");
  WriteBytes("/tmp/replace/plain", "x");
  struct Case {
    std::string path;
    int error;
  };
  const std::vector<Case> cases = {
      {"/tmp/replace/missing/settings.json", ENOENT},
      {"/tmp/replace/plain/settings.json", ENOTDIR},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.path);
    errno = 0;
    EXPECT_FALSE(ReplaceFile(c.path, "new", kMode));
    EXPECT_EQ(c.error, errno);
  }

  const test::ScopedMount mount = test::ScopedMount::ReadOnly(kDir);
  ASSERT_TRUE(mount.ok()) << strerror(errno);
  errno = 0;
  EXPECT_FALSE(ReplaceFile(kPath, "new", kMode));
  EXPECT_EQ(EROFS, errno);
  EXPECT_EQ("old", ReadBytes(kPath));
}

TEST(ReplaceFile, RenameOntoDirectoryRemovesTemporary) {
  FreshDir(kDir);
  FreshDir(kPath);  // a directory where the file should go
  errno = 0;
  EXPECT_FALSE(ReplaceFile(kPath, "new", kMode));
  EXPECT_EQ(EISDIR, errno);
  EXPECT_EQ(std::vector<std::string>{"settings.json"}, DirNames(kDir));
  EXPECT_TRUE(DirNames(kPath).empty());
}

}  // namespace
}  // namespace tavow3::base
