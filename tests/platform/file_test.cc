#include "tavo/tlib_file.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <string>

#include "support/test_files.h"
#include "support/test_mounts.h"

namespace {

using tavow3::test::FreshDir;
using tavow3::test::ReadBytes;
using tavow3::test::WriteBytes;

TEST(TLIBCFileExist, AnyObjectFollowingLinks) {
  FreshDir("/tmp/exist");
  WriteBytes("/tmp/exist/file", "x");
  ASSERT_EQ(0, ::symlink("/tmp/exist/file", "/tmp/exist/link"));
  ASSERT_EQ(0, ::symlink("/tmp/exist/gone", "/tmp/exist/dangling"));
  struct Case {
    const char* path;
    int result;
  } cases[] = {{"/tmp/exist/file", 1}, {"/tmp/exist", 1},       {"/tmp/exist/link", 1},
               {"/dev/null", 1},       {"/tmp/exist/dangling", 0}, {"/tmp/exist/gone", 0},
               {"/tmp/exist/file/x", 0}, {"", 0},                {nullptr, 0}};
  for (const Case& c : cases) {
    SCOPED_TRACE(c.path ? c.path : "(null)");
    EXPECT_EQ(c.result, TLIBCFileExist(c.path));
  }
}

TEST(TLIBCFileTouch, CreatesWithExactModeOrUpdatesTimes) {
  FreshDir("/tmp/touch");
  mode_t old_mask = ::umask(077);
  EXPECT_EQ(0, TLIBCFileTouch("/tmp/touch/new"));
  ::umask(old_mask);
  struct stat st;
  ASSERT_EQ(0, ::stat("/tmp/touch/new", &st));
  EXPECT_EQ(0644u, st.st_mode & 07777);
  EXPECT_EQ(0, st.st_size);

  WriteBytes("/tmp/touch/old", "kept", 0600);
  struct timespec long_ago[2] = {{1000, 0}, {1000, 0}};
  ASSERT_EQ(0, ::utimensat(AT_FDCWD, "/tmp/touch/old", long_ago, 0));
  EXPECT_EQ(0, TLIBCFileTouch("/tmp/touch/old"));
  ASSERT_EQ(0, ::stat("/tmp/touch/old", &st));
  EXPECT_GT(st.st_mtime, 1000);
  EXPECT_EQ(0600u, st.st_mode & 07777);
  EXPECT_EQ("kept", ReadBytes("/tmp/touch/old"));
}

TEST(TLIBCFileTouch, Failures) {
  FreshDir("/tmp/touch");
  WriteBytes("/tmp/touch/file", "");
  FreshDir("/tmp/touch/ro");
  ASSERT_TRUE(tavow3::test::BindReadOnly("/tmp/touch/ro"));
  struct Case {
    const char* path;
    int error;
  } cases[] = {{"/tmp/touch/missing/new", ENOENT},
               {"/tmp/touch/file/new", ENOTDIR},
               {"/tmp/touch/ro/new", EROFS},
               {"", EINVAL},
               {nullptr, EINVAL}};
  for (const Case& c : cases) {
    SCOPED_TRACE(c.path ? c.path : "(null)");
    errno = 0;
    EXPECT_EQ(-1, TLIBCFileTouch(c.path));
    EXPECT_EQ(c.error, errno);
  }
  EXPECT_EQ(0, TLIBCFileExist("/tmp/touch/ro/new"));
}

TEST(TLIBCFileCheckKeyValue, ShellStyleLines) {
  WriteBytes("/tmp/keys.conf",
             "# userHomeEnable=\"no\"\n"
             "userHomeEnableX=\"yes\"\n"
             "  userHomeEnable=\"no\"\n"
             "userHomeEnable=\"yes\"\r\n"
             "plain=bare value\n"
             "single='quoted'\n"
             "empty=\"\"\n"
             "\n"
             "half=\"open\n"
             "eq=a=b\n");
  struct Case {
    const char* key;
    const char* value;
    int result;
  } cases[] = {
      {"userHomeEnable", "yes", 1}, {"userHomeEnable", "no", 0}, {"userHomeEnableX", "yes", 1},
      {"userHome", "yes", 0},       {"plain", "bare value", 1},  {"single", "quoted", 1},
      {"empty", "", 1},             {"half", "\"open", 1},       {"eq", "a=b", 1},
      {"absent", "", 0},            {"# userHomeEnable", "no", 0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(std::string(c.key) + "=" + c.value);
    EXPECT_EQ(c.result, TLIBCFileCheckKeyValue("/tmp/keys.conf", c.key, c.value));
  }
  errno = 0;
  EXPECT_EQ(-1, TLIBCFileCheckKeyValue("/tmp/missing.conf", "a", "b"));
  EXPECT_EQ(ENOENT, errno);
  EXPECT_EQ(-1, TLIBCFileCheckKeyValue("/tmp", "a", "b"));
  EXPECT_EQ(-1, TLIBCFileCheckKeyValue("/tmp/keys.conf", nullptr, "b"));
}

}  // namespace
