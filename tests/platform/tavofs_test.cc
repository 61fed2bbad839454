#include "tavo/tavofs.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <string>
#include <vector>

#include "support/test_files.h"
#include "support/test_mounts.h"

namespace {

using tavow3::test::DirNames;
using tavow3::test::FreshDir;
using tavow3::test::ReadBytes;
using tavow3::test::WriteBytes;

struct stat Stat(const std::string& path) {
  struct stat st = {};
  EXPECT_EQ(0, ::stat(path.c_str(), &st)) << path;
  return st;
}

TEST(TAVOFSMkdirP, CreatesMissingDirectoriesWithExactMode) {
  FreshDir("/var/tmp/mk");
  ASSERT_EQ(0, ::chmod("/var/tmp/mk", 0700));
  mode_t old_mask = ::umask(077);
  EXPECT_EQ(0, TAVOFSMkdirP("/var/tmp/mk//a/b/c/", 0, 0755));
  ::umask(old_mask);
  EXPECT_EQ(0700u, Stat("/var/tmp/mk").st_mode & 07777);  // existed: untouched
  for (const char* dir : {"/var/tmp/mk/a", "/var/tmp/mk/a/b", "/var/tmp/mk/a/b/c"}) {
    SCOPED_TRACE(dir);
    struct stat st = Stat(dir);
    EXPECT_TRUE(S_ISDIR(st.st_mode));
    EXPECT_EQ(0755u, st.st_mode & 07777);
    EXPECT_EQ(0u, st.st_uid);
  }
  EXPECT_EQ(0, TAVOFSMkdirP("/var/tmp/mk/a/b/c", 0, 0700));  // already there
  EXPECT_EQ(0755u, Stat("/var/tmp/mk/a/b/c").st_mode & 07777);
  ASSERT_EQ(0, ::chdir("/var/tmp/mk"));
  EXPECT_EQ(0, TAVOFSMkdirP("rel/x", 0, 0750));
  EXPECT_EQ(0750u, Stat("/var/tmp/mk/rel/x").st_mode & 07777);
  ASSERT_EQ(0, ::chdir("/"));
}

TEST(TAVOFSMkdirP, OwnerGoesToCreatedDirectoriesOnly) {
  FreshDir("/var/tmp/mk");
  EXPECT_EQ(0, TAVOFSMkdirP("/var/tmp/mk/www/sub", 0, 1, 1, 1, 0755));
  EXPECT_EQ(0u, Stat("/var/tmp/mk").st_uid);
  for (const char* dir : {"/var/tmp/mk/www", "/var/tmp/mk/www/sub"}) {
    SCOPED_TRACE(dir);
    struct stat st = Stat(dir);
    EXPECT_EQ(1u, st.st_uid);
    EXPECT_EQ(1u, st.st_gid);
    EXPECT_EQ(0755u, st.st_mode & 07777);
  }
  EXPECT_EQ(0, TAVOFSMkdirP("/var/tmp/mk/plain", 0, 0, 1, 1, 0755));
  EXPECT_EQ(0u, Stat("/var/tmp/mk/plain").st_uid);
}

TEST(TAVOFSMkdirP, Failures) {
  FreshDir("/var/tmp/mk");
  WriteBytes("/var/tmp/mk/file", "x");
  FreshDir("/var/tmp/mk/ro");
  ASSERT_TRUE(tavow3::test::BindReadOnly("/var/tmp/mk/ro"));
  struct Case {
    const char* path;
    int flags;
    int error;
  } cases[] = {
      {"/var/tmp/mk/file", 0, ENOTDIR},   {"/var/tmp/mk/file/sub", 0, ENOTDIR},
      {"/var/tmp/mk/ro/new", 0, EROFS},   {"/var/tmp/mk/ok", 1, EINVAL},
      {"", 0, EINVAL},                    {nullptr, 0, EINVAL},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.path ? c.path : "(null)");
    errno = 0;
    EXPECT_EQ(-1, TAVOFSMkdirP(c.path, c.flags, 0755));
    EXPECT_EQ(c.error, errno);
    errno = 0;
    EXPECT_EQ(-1, TAVOFSMkdirP(c.path, c.flags, 1, 1, 1, 0755));
    EXPECT_EQ(c.error, errno);
  }
  EXPECT_EQ((std::vector<std::string>{"file", "ro"}), DirNames("/var/tmp/mk"));
}

TEST(TAVOFileCopy, CopiesBytesAndModeOverTheOldFile) {
  FreshDir("/var/tmp/cp");
  std::string big;
  for (int i = 0; i < 200000; ++i) big.push_back(static_cast<char>(i * 7));  // NULs included
  WriteBytes("/var/tmp/cp/from", big, 0640);
  WriteBytes("/var/tmp/cp/to", "old", 0600);
  ino_t old_inode = Stat("/var/tmp/cp/to").st_ino;
  EXPECT_EQ(0, TAVOFileCopy("/var/tmp/cp/from", "/var/tmp/cp/to"));
  EXPECT_EQ(big, ReadBytes("/var/tmp/cp/to"));
  struct stat st = Stat("/var/tmp/cp/to");
  EXPECT_EQ(0640u, st.st_mode & 07777);
  EXPECT_NE(old_inode, st.st_ino);  // replaced, not rewritten
  WriteBytes("/var/tmp/cp/empty", "", 0644);
  EXPECT_EQ(0, TAVOFileCopy("/var/tmp/cp/empty", "/var/tmp/cp/new"));
  EXPECT_EQ("", ReadBytes("/var/tmp/cp/new"));
  EXPECT_EQ((std::vector<std::string>{"empty", "from", "new", "to"}), DirNames("/var/tmp/cp"));
}

// Each failure leaves the target's old bytes and no temporary file.
TEST(TAVOFileCopy, FailuresKeepTheOldFile) {
  FreshDir("/var/tmp/cp");
  WriteBytes("/var/tmp/cp/from", std::string(64 * 1024, 'n'));
  WriteBytes("/var/tmp/cp/ro/to", "old");
  ASSERT_TRUE(tavow3::test::BindReadOnly("/var/tmp/cp/ro"));
  ASSERT_TRUE(tavow3::test::MountTmpfs("/var/tmp/cp/full", "size=16k"));
  WriteBytes("/var/tmp/cp/full/to", "old");
  WriteBytes("/var/tmp/cp/locked/to", "old");
  ASSERT_TRUE(tavow3::test::SetImmutable("/var/tmp/cp/locked", true));
  WriteBytes("/var/tmp/cp/pinned/to", "old");
  ASSERT_TRUE(tavow3::test::SetImmutable("/var/tmp/cp/pinned/to", true));
  FreshDir("/var/tmp/cp/dir");
  struct Case {
    const char* from;
    const char* to;
    int error;
  } cases[] = {
      {"/var/tmp/cp/from", "/var/tmp/cp/ro/to", EROFS},
      {"/var/tmp/cp/from", "/var/tmp/cp/full/to", ENOSPC},
      {"/var/tmp/cp/from", "/var/tmp/cp/locked/to", EPERM},
      {"/var/tmp/cp/from", "/var/tmp/cp/pinned/to", EPERM},
      {"/var/tmp/cp/missing", "/var/tmp/cp/full/to", ENOENT},
      {"/var/tmp/cp/dir", "/var/tmp/cp/full/to", EISDIR},
      {"/dev/null", "/var/tmp/cp/full/to", EINVAL},
      {"/var/tmp/cp/from", "/var/tmp/cp/nodir/to", ENOENT},
      {"/var/tmp/cp/from", "", EINVAL},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(std::string(c.from) + " -> " + c.to);
    errno = 0;
    EXPECT_EQ(-1, TAVOFileCopy(c.from, c.to));
    EXPECT_EQ(c.error, errno);
  }
  for (const char* dir : {"/var/tmp/cp/ro", "/var/tmp/cp/full", "/var/tmp/cp/locked",
                          "/var/tmp/cp/pinned"}) {
    SCOPED_TRACE(dir);
    EXPECT_EQ("old", ReadBytes(std::string(dir) + "/to"));
    EXPECT_EQ(std::vector<std::string>{"to"}, DirNames(dir));
  }
  EXPECT_EQ(-1, TAVOFileCopy(nullptr, "/var/tmp/cp/x"));
  EXPECT_EQ(-1, TAVOFileCopy("/var/tmp/cp/from", nullptr));
  EXPECT_TRUE(tavow3::test::SetImmutable("/var/tmp/cp/locked", false));
  EXPECT_TRUE(tavow3::test::SetImmutable("/var/tmp/cp/pinned/to", false));
}

}  // namespace
