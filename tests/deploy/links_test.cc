#include "deploy/nginx_links.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <functional>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "base/fault.h"
#include "deploy_fixtures.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::test {
namespace {

using deploy::MakeLink;
using deploy::RemovePath;

constexpr char kTarget[] = "/tmp/links/target";
constexpr char kLink[] = "/tmp/links/link";

void Symlink(const std::string& target, const std::string& link) {
  ASSERT_EQ(0, ::symlink(target.c_str(), link.c_str())) << link;
}

TEST(MakeLink, ArrangesTheLinkWhateverStandsAtItsPath) {
  const struct {
    const char* name;
    std::function<void()> before;
    size_t backups;     // of the link path
    const char* saved;  // file expected inside (or as) the backup, "" for none
    bool same_inode;    // the link itself was left untouched
  } cases[] = {
      {"nothing", [] {}, 0, "", false},
      {"right link", [] { Symlink(kTarget, kLink); }, 0, "", true},
      {"wrong link", [] { Symlink("/tmp/links/elsewhere", kLink); }, 0, "", false},
      {"link with a trailing slash", [] { Symlink(std::string(kTarget) + "/", kLink); }, 0, "",
       false},
      {"dangling link", [] { Symlink("/nonexistent", kLink); }, 0, "", false},
      {"real directory", [] { WriteBytes(std::string(kLink) + "/site.conf", "dir\n"); }, 1,
       "/site.conf", false},
      {"regular file", [] { WriteBytes(kLink, "file\n"); }, 1, "", false},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    RemoveTree("/tmp/links");
    WriteBytes(std::string(kTarget) + "/keep.conf", "keep\n");
    c.before();
    const ino_t inode_before = InodeOf(kLink);
    ClearLog();

    EXPECT_TRUE(MakeLink(kTarget, kLink));
    EXPECT_EQ(kTarget, LinkTarget(kLink));
    EXPECT_EQ("keep\n", ReadBytes(std::string(kLink) + "/keep.conf"));
    EXPECT_EQ(c.same_inode, InodeOf(kLink) == inode_before);
    const std::vector<std::string> backups = BackupsOf(kLink);
    ASSERT_EQ(c.backups, backups.size());
    if (c.backups == 1) {
      EXPECT_EQ(std::string(c.name) == "real directory" ? "dir\n" : "file\n",
                ReadBytes(backups[0] + c.saved));
    }
    EXPECT_TRUE(TaggedLogMessages("nginx_deploy").empty());
  }
}

TEST(MakeLink, MakesOrReplacesTheTargetDirectory) {
  const std::string target = "/tmp/links/a/b/target";
  const struct {
    const char* name;
    std::function<void()> before;
    size_t backups;    // of the target
    bool file_kept;    // /tmp/links/file still there
  } cases[] = {
      {"missing with its parents", [] {}, 0, false},
      {"regular file", [&] { WriteBytes(target, "file\n"); }, 1, false},
      {"link to a file", [&] {
         WriteBytes("/tmp/links/file", "file\n");
         MustRun({"/bin/mkdir", "-p", "/tmp/links/a/b"});
         Symlink("/tmp/links/file", target);
       }, 0, true},
      {"directory", [&] { WriteBytes(target + "/keep.conf", "keep\n"); }, 0, false},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    RemoveTree("/tmp/links");
    ASSERT_EQ(0, ::mkdir("/tmp/links", 0700));
    c.before();
    ClearLog();
    EXPECT_TRUE(MakeLink(target, kLink));
    EXPECT_TRUE(IsDirectory(target));
    EXPECT_EQ(target, LinkTarget(kLink));
    EXPECT_EQ(0755u, ModeOf("/tmp/links/a"));
    if (std::string(c.name) == "directory") {
      EXPECT_EQ("keep\n", ReadBytes(target + "/keep.conf"));
    } else {
      EXPECT_EQ(0755u, ModeOf(target));
    }
    const std::vector<std::string> backups = BackupsOf(target);
    ASSERT_EQ(c.backups, backups.size());
    if (c.backups == 1) {
      EXPECT_EQ("file\n", ReadBytes(backups[0]));
    }
    EXPECT_EQ(c.file_kept, ReadBytes("/tmp/links/file") == "file\n");
    EXPECT_TRUE(TaggedLogMessages("nginx_deploy").empty());
  }
}

TEST(MakeLink, RefusesBadArgumentsAndUnmakeableTargets) {
  ClearLog();
  EXPECT_FALSE(MakeLink("", kLink));
  EXPECT_FALSE(MakeLink(kTarget, ""));
  EXPECT_EQ(std::vector<std::string>(2, "nginx_deploy:500 Bad parameter!"),
            TaggedLogMessages("nginx_deploy"));

  RemoveTree("/tmp/links");
  WriteBytes("/tmp/links/plain", "plain\n");
  ClearLog();
  EXPECT_FALSE(MakeLink("/tmp/links/plain/sub", kLink));
  EXPECT_EQ(std::vector<std::string>{"nginx_deploy:514 TAVOFSMkdirP failed "
                                     "(/tmp/links/plain/sub, Not a directory)"},
            TaggedLogMessages("nginx_deploy"));
  EXPECT_FALSE(PathExists(kLink));
}

TEST(MakeLink, FailedSymlinkIsLoggedButReportedAsSuccess) {
  RemoveTree("/tmp/links");
  ClearLog();
  EXPECT_TRUE(MakeLink(kTarget, "/tmp/links/missing/link"));
  EXPECT_EQ(std::vector<std::string>{"nginx_deploy:533 Cannot make link from /tmp/links/target "
                                     "to /tmp/links/missing/link, No such file or directory"},
            TaggedLogMessages("nginx_deploy"));
  EXPECT_TRUE(IsDirectory(kTarget));
}

TEST(RemovePath, BacksUpOrDeletesAndLogsEachFailure) {
  using base::fault::Op;
  const struct {
    const char* name;
    bool directory;
    Op failing;
    int nth;
    bool result;
    bool still_there;
    std::vector<std::string> log;
  } cases[] = {
      {"file, backup fails", false, Op::kRename, 1, true, false,
       {"nginx_deploy:483 failed to backup /tmp/links/link, Input/output error"}},
      {"directory, backup fails", true, Op::kRename, 1, false, true,
       {"nginx_deploy:483 failed to backup /tmp/links/link, Input/output error",
        "nginx_deploy:485 failed to delete /tmp/links/link, Is a directory"}},
      {"file, no backup name", false, Op::kMkstemp, 1, true, false,
       {"nginx_deploy:483 failed to backup /tmp/links/link, Input/output error"}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    RemoveTree("/tmp/links");
    WriteBytes(c.directory ? std::string(kLink) + "/f" : std::string(kLink), "x\n");
    ClearLog();
    {
      base::fault::Arm arm(c.nth, base::fault::kOnce, EIO, c.failing);
      EXPECT_EQ(c.result, RemovePath(kLink));
      EXPECT_TRUE(arm.fired());
    }
    EXPECT_EQ(c.log, TaggedLogMessages("nginx_deploy"));
    EXPECT_EQ(c.still_there, PathExists(kLink));
    EXPECT_TRUE(BackupsOf(kLink).empty());  // no stray placeholder either
  }

  // On a read-only file system neither the backup nor the deletion works.
  RemoveTree("/tmp/links");
  WriteBytes("/tmp/links/ro/file", "x\n");
  MustRun({"/bin/mount", "--bind", "/tmp/links/ro", "/tmp/links/ro"});
  MustRun({"/bin/mount", "-o", "remount,bind,ro", "/tmp/links/ro"});
  ClearLog();
  EXPECT_FALSE(RemovePath("/tmp/links/ro/file"));
  EXPECT_EQ((std::vector<std::string>{
                "nginx_deploy:483 failed to backup /tmp/links/ro/file, Read-only file system",
                "nginx_deploy:485 failed to delete /tmp/links/ro/file, Read-only file system"}),
            TaggedLogMessages("nginx_deploy"));
  EXPECT_EQ("x\n", ReadBytes("/tmp/links/ro/file"));
  MustRun({"/bin/umount", "/tmp/links/ro"});

  RemoveTree("/tmp/links");
  ASSERT_EQ(0, ::mkdir("/tmp/links", 0755));
  Symlink(kTarget, kLink);
  ClearLog();
  {
    base::fault::Arm arm(1, base::fault::kOnce, EPERM, Op::kUnlink);
    EXPECT_FALSE(RemovePath(kLink));
  }
  EXPECT_EQ(std::vector<std::string>{"nginx_deploy:471 Cannot delete link /tmp/links/link, "
                                     "Operation not permitted"},
            TaggedLogMessages("nginx_deploy"));
  EXPECT_EQ(kTarget, LinkTarget(kLink));
}

TEST(RemovePath, TooLongBackupNameFallsBackToDeleting) {
  RemoveTree("/tmp/links");
  // Spread over directories: a single name may hold 255 bytes only.
  std::string deep = "/tmp/links";
  while (deep.size() + 201 < 1020) deep += "/" + std::string(200, 'd');
  deep += "/" + std::string(1020 - deep.size() - 1, 'f');
  ASSERT_EQ(1020u, deep.size());
  WriteBytes(deep, "x\n");
  ClearLog();
  EXPECT_TRUE(RemovePath(deep));
  EXPECT_FALSE(PathExists(deep));
  EXPECT_EQ(std::vector<std::string>{"nginx_deploy:483 failed to backup " + deep +
                                     ", File name too long"},
            TaggedLogMessages("nginx_deploy"));
}

}  // namespace
}  // namespace tavow3::test
