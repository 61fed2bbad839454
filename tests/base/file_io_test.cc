#include "base/file_io.h"

#include <fcntl.h>
#include <pthread.h>
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstring>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "base/fault.h"
#include "support/test_files.h"
#include "support/test_mounts.h"
#include "support/test_process.h"

namespace tavow3::base {
namespace {

using test::FreshDir;
using test::ReadBytes;
using test::WriteBytes;

constexpr char kDir[] = "/tmp/fileio";

// Each wrapper's real failures: errno from the kernel, outputs untouched.
TEST(FileIo, RealFailuresSetErrno) {
  FreshDir(kDir);
  WriteBytes("/tmp/fileio/file", "bytes");
  FreshDir("/tmp/fileio/full");
  WriteBytes("/tmp/fileio/full/entry", "");
  ASSERT_EQ(0, ::symlink("file", "/tmp/fileio/link"));

  std::string text = "kept";
  std::vector<std::string> list = {"kept"};
  struct stat st;
  struct Case {
    const char* what;
    std::function<bool()> call;
    int error;
  };
  const std::vector<Case> cases = {
      {"Open missing", [] { return Open("/tmp/fileio/missing", O_RDONLY).valid(); }, ENOENT},
      {"Open under file", [] { return Open("/tmp/fileio/file/x", O_RDONLY).valid(); }, ENOTDIR},
      {"Open exclusive",
       [] { return Open("/tmp/fileio/file", O_WRONLY | O_CREAT | O_EXCL, 0644).valid(); }, EEXIST},
      {"MakeTemp missing dir",
       [&] { return MakeTemp("/tmp/fileio/missing/t.XXXXXX", &text).valid(); }, ENOENT},
      {"MakeTemp bad pattern", [&] { return MakeTemp("/tmp/fileio/t.XXX", &text).valid(); },
       EINVAL},
      {"ReadFile missing", [&] { return ReadFile("/tmp/fileio/missing", &text); }, ENOENT},
      {"ReadFile directory", [&] { return ReadFile(kDir, &text); }, EISDIR},
      {"Rename missing", [] { return Rename("/tmp/fileio/missing", "/tmp/fileio/x"); }, ENOENT},
      {"Rename file over dir", [] { return Rename("/tmp/fileio/file", "/tmp/fileio/full"); },
       EISDIR},
      {"Unlink missing", [] { return Unlink("/tmp/fileio/missing"); }, ENOENT},
      {"Unlink directory", [] { return Unlink("/tmp/fileio/full"); }, EISDIR},
      {"Rmdir not empty", [] { return Rmdir("/tmp/fileio/full"); }, ENOTEMPTY},
      {"Rmdir file", [] { return Rmdir("/tmp/fileio/file"); }, ENOTDIR},
      {"Mkdir existing", [] { return Mkdir("/tmp/fileio/full", 0755); }, EEXIST},
      {"Mkdir under file", [] { return Mkdir("/tmp/fileio/file/sub", 0755); }, ENOTDIR},
      {"Mkdir missing parent", [] { return Mkdir("/tmp/fileio/a/b", 0755); }, ENOENT},
      {"Chmod missing", [] { return Chmod("/tmp/fileio/missing", 0644); }, ENOENT},
      {"Chown missing", [] { return Chown("/tmp/fileio/missing", 1, 1); }, ENOENT},
      {"Symlink existing", [] { return Symlink("x", "/tmp/fileio/file"); }, EEXIST},
      {"Readlink of file", [&] { return Readlink("/tmp/fileio/file", &text); }, EINVAL},
      {"Readlink missing", [&] { return Readlink("/tmp/fileio/missing", &text); }, ENOENT},
      {"Stat missing", [&] { return Stat("/tmp/fileio/missing", &st); }, ENOENT},
      {"Lstat under file", [&] { return Lstat("/tmp/fileio/file/x", &st); }, ENOTDIR},
      {"Exists missing", [] { return Exists("/tmp/fileio/missing"); }, ENOENT},
      {"ListDir missing", [&] { return ListDir("/tmp/fileio/missing", &list); }, ENOENT},
      {"ListDir file", [&] { return ListDir("/tmp/fileio/file", &list); }, ENOTDIR},
      {"Fsync bad fd", [] { return Fsync(-1); }, EBADF},
      {"Fchmod bad fd", [] { return Fchmod(-1, 0644); }, EBADF},
      {"Fchown bad fd", [] { return Fchown(-1, 1, 1); }, EBADF},
      {"WriteAll bad fd", [] { return WriteAll(-1, "x"); }, EBADF},
      {"ReadAll bad fd", [&] { return ReadAll(-1, &text); }, EBADF},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    errno = 0;
    EXPECT_FALSE(c.call());
    EXPECT_EQ(c.error, errno) << strerror(errno);
    EXPECT_EQ("kept", text);
    EXPECT_EQ(std::vector<std::string>{"kept"}, list);
  }
  EXPECT_EQ("bytes", ReadBytes("/tmp/fileio/file"));
}

// The same calls on a read-only mount: nothing changes, EROFS.
TEST(FileIo, ReadOnlyMountRefusesChanges) {
  FreshDir(kDir);
  WriteBytes("/tmp/fileio/file", "bytes");
  FreshDir("/tmp/fileio/sub");
  const test::ScopedMount mount = test::ScopedMount::ReadOnly(kDir);
  ASSERT_TRUE(mount.ok()) << strerror(errno);
  std::string temp;
  struct Case {
    const char* what;
    std::function<bool()> call;
  };
  const std::vector<Case> cases = {
      {"Open for writing", [] { return Open("/tmp/fileio/file", O_WRONLY).valid(); }},
      {"MakeTemp", [&] { return MakeTemp("/tmp/fileio/t.XXXXXX", &temp).valid(); }},
      {"Rename", [] { return Rename("/tmp/fileio/file", "/tmp/fileio/moved"); }},
      {"Unlink", [] { return Unlink("/tmp/fileio/file"); }},
      {"Rmdir", [] { return Rmdir("/tmp/fileio/sub"); }},
      {"Mkdir", [] { return Mkdir("/tmp/fileio/new", 0755); }},
      {"Chmod", [] { return Chmod("/tmp/fileio/file", 0600); }},
      {"Chown", [] { return Chown("/tmp/fileio/file", 1, 1); }},
      {"Symlink", [] { return Symlink("file", "/tmp/fileio/link"); }},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    errno = 0;
    EXPECT_FALSE(c.call());
    EXPECT_EQ(EROFS, errno) << strerror(errno);
  }
  EXPECT_TRUE(temp.empty());
  EXPECT_EQ("bytes", ReadBytes("/tmp/fileio/file"));
  EXPECT_EQ((std::vector<std::string>{"file", "sub"}), test::DirNames(kDir));
}

// Every wrapper asks the hook before it touches the system.
TEST(FileIo, FaultHookFailsEachWrapperFirst) {
  FreshDir(kDir);
  WriteBytes("/tmp/fileio/file", "bytes");
  ASSERT_EQ(0, ::symlink("file", "/tmp/fileio/link"));
  std::string text = "kept";
  std::vector<std::string> list = {"kept"};
  struct stat st;
  UniqueFd read_end;
  UniqueFd write_end;
  struct Case {
    const char* what;
    fault::Op op;
    std::function<bool()> call;
  };
  const std::vector<Case> cases = {
      {"Open", fault::Op::kOpen,
       [] { return Open("/tmp/fileio/new", O_WRONLY | O_CREAT, 0644).valid(); }},
      {"MakeTemp", fault::Op::kMkstemp,
       [&] { return MakeTemp("/tmp/fileio/t.XXXXXX", &text).valid(); }},
      {"Pipe", fault::Op::kOpen, [&] { return Pipe(&read_end, &write_end); }},
      {"ReadFile", fault::Op::kRead, [&] { return ReadFile("/tmp/fileio/file", &text); }},
      {"Rename", fault::Op::kRename, [] { return Rename("/tmp/fileio/file", "/tmp/fileio/new"); }},
      {"Unlink", fault::Op::kUnlink, [] { return Unlink("/tmp/fileio/file"); }},
      {"Mkdir", fault::Op::kMkdir, [] { return Mkdir("/tmp/fileio/new", 0755); }},
      {"Rmdir", fault::Op::kRmdir, [] { return Rmdir(kDir); }},
      {"Chmod", fault::Op::kChmod, [] { return Chmod("/tmp/fileio/file", 0600); }},
      {"Chown", fault::Op::kChown, [] { return Chown("/tmp/fileio/file", 1, 1); }},
      {"Symlink", fault::Op::kSymlink, [] { return Symlink("file", "/tmp/fileio/new"); }},
      {"Readlink", fault::Op::kReadlink, [&] { return Readlink("/tmp/fileio/link", &text); }},
      {"Stat", fault::Op::kStat, [&] { return Stat("/tmp/fileio/file", &st); }},
      {"Lstat", fault::Op::kStat, [&] { return Lstat("/tmp/fileio/link", &st); }},
      {"Exists", fault::Op::kStat, [] { return Exists("/tmp/fileio/file"); }},
      {"Glob", fault::Op::kGlob, [&] { return Glob("/tmp/fileio/*", &list); }},
      {"ListDir", fault::Op::kOpendir, [&] { return ListDir(kDir, &list); }},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    fault::Arm arm(1, fault::kOnce, EDOM, c.op);
    errno = 0;
    EXPECT_FALSE(c.call());
    EXPECT_EQ(EDOM, errno);
    EXPECT_TRUE(arm.fired());
  }
  EXPECT_EQ("kept", text);
  EXPECT_EQ(std::vector<std::string>{"kept"}, list);
  EXPECT_FALSE(read_end.valid());
  EXPECT_EQ((std::vector<std::string>{"file", "link"}), test::DirNames(kDir));
  struct stat file_st;
  ASSERT_EQ(0, ::stat("/tmp/fileio/file", &file_st));
  EXPECT_EQ(0u, file_st.st_uid);
  EXPECT_EQ(0644u, file_st.st_mode & 07777);
}

TEST(FileIo, DescriptorsAreCloseOnExec) {
  FreshDir(kDir);
  std::string temp;
  UniqueFd opened = Open("/tmp/fileio/file", O_WRONLY | O_CREAT, 0644);
  UniqueFd made = MakeTemp("/tmp/fileio/t.XXXXXX", &temp);
  UniqueFd read_end;
  UniqueFd write_end;
  ASSERT_TRUE(Pipe(&read_end, &write_end));
  for (const UniqueFd* fd : {&opened, &made, &read_end, &write_end}) {
    ASSERT_TRUE(fd->valid());
    EXPECT_TRUE(test::IsCloseOnExec(fd->get()));
  }
  EXPECT_EQ(0u, temp.rfind("/tmp/fileio/t.", 0));
  EXPECT_EQ(std::string::npos, temp.find("XXXXXX"));
  EXPECT_EQ("", ReadBytes(temp));
}

TEST(FileIo, ReadlinkReturnsWholeTarget) {
  FreshDir(kDir);
  // Around the first buffer size and up to the longest path a link may hold.
  for (size_t length : {1, 255, 256, 257, 1000, 4095}) {
    SCOPED_TRACE(length);
    std::string target(length, 'a');
    for (size_t i = 0; i < length; i += 7) target[i] = static_cast<char>('0' + i % 10);
    const std::string link = "/tmp/fileio/link" + std::to_string(length);
    ASSERT_TRUE(Symlink(target, link)) << strerror(errno);
    std::string read_back;
    ASSERT_TRUE(Readlink(link, &read_back)) << strerror(errno);
    EXPECT_EQ(target, read_back);
  }
}

TEST(FileIo, GlobAndListDirAreSorted) {
  FreshDir(kDir);
  for (const char* name : {"b.json", "a.json", "B.json", "c.txt", ".hidden.json"}) {
    WriteBytes(std::string(kDir) + "/" + name, "");
  }
  std::vector<std::string> paths = {"stale"};
  ASSERT_TRUE(Glob("/tmp/fileio/*.json", &paths));
  EXPECT_EQ((std::vector<std::string>{"/tmp/fileio/B.json", "/tmp/fileio/a.json",
                                      "/tmp/fileio/b.json"}),
            paths);

  paths = {"stale"};
  EXPECT_TRUE(Glob("/tmp/fileio/*.none", &paths));
  EXPECT_TRUE(paths.empty());
  paths = {"stale"};
  EXPECT_TRUE(Glob("/tmp/fileio/missing/*/x", &paths));
  EXPECT_TRUE(paths.empty());

  std::vector<std::string> names;
  ASSERT_TRUE(ListDir(kDir, &names));
  EXPECT_EQ((std::vector<std::string>{".hidden.json", "B.json", "a.json", "b.json", "c.txt"}),
            names);
  FreshDir("/tmp/fileio/empty");
  names = {"stale"};
  ASSERT_TRUE(ListDir("/tmp/fileio/empty", &names));
  EXPECT_TRUE(names.empty());
}

TEST(FileIo, ReadAllAppendsAndReadFileReplaces) {
  FreshDir(kDir);
  const std::string big(200 * 1024 + 3, 'z');  // several read chunks
  WriteBytes("/tmp/fileio/file", big);
  std::string text = "prefix:";
  UniqueFd fd = Open("/tmp/fileio/file", O_RDONLY);
  ASSERT_TRUE(ReadAll(fd.get(), &text));
  EXPECT_EQ("prefix:" + big, text);

  text = "old";
  ASSERT_TRUE(ReadFile("/tmp/fileio/file", &text));
  EXPECT_EQ(big, text);

  // A failure on a later chunk keeps what the caller had.
  fd = Open("/tmp/fileio/file", O_RDONLY);
  text = "prefix:";
  {
    fault::Arm arm(2, fault::kOnce, EIO, fault::Op::kRead);
    EXPECT_FALSE(ReadAll(fd.get(), &text));
  }
  EXPECT_EQ("prefix:", text);
}

std::atomic<int> g_signals{0};

void CountSignal(int) { ++g_signals; }

void CatchSignal(int sig) {
  struct sigaction action = {};
  action.sa_handler = CountSignal;  // no SA_RESTART: blocked calls fail with EINTR
  ASSERT_EQ(0, ::sigaction(sig, &action, nullptr));
}

// A signal that arrives before a blocked pipe write or read moved a byte
// makes the call fail with EINTR; the wrappers start it again.
TEST(FileIo, BlockedPipeCallsResumeAfterSignals) {
  CatchSignal(SIGUSR1);
  UniqueFd read_end;
  UniqueFd write_end;
  ASSERT_TRUE(Pipe(&read_end, &write_end));
  ASSERT_EQ(0, ::fcntl(write_end.get(), F_SETFL, O_NONBLOCK));
  std::string filler;
  while (::write(write_end.get(), "f", 1) == 1) filler += 'f';
  ASSERT_EQ(EAGAIN, errno);
  ASSERT_EQ(0, ::fcntl(write_end.get(), F_SETFL, 0));

  const std::string sent(256 * 1024, 's');
  std::atomic<int> writer_tid{0};
  bool wrote = false;
  std::thread writer([&] {
    writer_tid = static_cast<int>(::gettid());
    wrote = WriteAll(write_end.get(), sent);
    (void)write_end.Reset();
  });
  while (writer_tid == 0) std::this_thread::yield();
  test::WaitUntilBlockedIn(writer_tid, "pipe_write");  // the pipe is full
  int signals = g_signals;
  ::pthread_kill(writer.native_handle(), SIGUSR1);
  while (g_signals == signals) std::this_thread::yield();  // handled before any room was made
  std::string received;
  ASSERT_TRUE(ReadAll(read_end.get(), &received));
  writer.join();
  EXPECT_TRUE(wrote);
  EXPECT_EQ(filler.size() + sent.size(), received.size());
  EXPECT_TRUE(filler + sent == received);

  // The same for a reader waiting on an empty pipe.
  ASSERT_TRUE(Pipe(&read_end, &write_end));
  std::atomic<int> reader_tid{0};
  bool read = false;
  received.clear();
  std::thread reader([&] {
    reader_tid = static_cast<int>(::gettid());
    read = ReadAll(read_end.get(), &received);
  });
  while (reader_tid == 0) std::this_thread::yield();
  test::WaitUntilBlockedIn(reader_tid, "pipe_read");
  signals = g_signals;
  ::pthread_kill(reader.native_handle(), SIGUSR1);
  while (g_signals == signals) std::this_thread::yield();
  ASSERT_TRUE(WriteAll(write_end.get(), "late"));
  (void)write_end.Reset();
  reader.join();
  EXPECT_TRUE(read);
  EXPECT_EQ("late", received);
}

// Signals without SA_RESTART interrupt blocked pipe transfers, giving short
// counts and EINTR; every byte must still arrive once and in order.
TEST(FileIo, PipeTransfersSurviveSignals) {
  CatchSignal(SIGUSR1);  // left installed: a late signal must not kill the process

  UniqueFd read_end;
  UniqueFd write_end;
  ASSERT_TRUE(Pipe(&read_end, &write_end));
  std::string sent(4 * 1024 * 1024, '\0');
  for (size_t i = 0; i < sent.size(); ++i) sent[i] = static_cast<char>(i * 131 % 251);

  std::atomic<bool> done{false};
  bool wrote = false;
  std::thread writer([&] {
    wrote = WriteAll(write_end.get(), sent);
    (void)write_end.Reset();
    done = true;
  });
  const pthread_t writer_thread = writer.native_handle();
  const pthread_t reader_thread = ::pthread_self();
  std::thread interrupter([&] {
    while (!done) {
      ::pthread_kill(writer_thread, SIGUSR1);
      ::pthread_kill(reader_thread, SIGUSR1);
      std::this_thread::yield();
    }
  });
  std::string received;
  const bool read = ReadAll(read_end.get(), &received);
  writer.join();
  interrupter.join();

  EXPECT_TRUE(wrote);
  EXPECT_TRUE(read);
  EXPECT_EQ(sent.size(), received.size());
  EXPECT_TRUE(sent == received);
}

}  // namespace
}  // namespace tavow3::base
