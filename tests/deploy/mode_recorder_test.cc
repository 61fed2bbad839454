#include <tavow3/nginx_mode_recorder.h>

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <string>

#include <gtest/gtest.h>

#include "base/fault.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"

namespace tavow3::test {
namespace {

constexpr char kShmFile[] = "/dev/shm/nginx_mod";
constexpr size_t kRecordSize = 4096;

std::string Record(const std::string& text) {
  std::string bytes(kRecordSize, '\0');
  bytes.replace(0, text.size(), text);
  return bytes;
}

// GetMode() as a separate process sees it.
int ModeInChild() {
  const pid_t pid = ::fork();
  if (pid == 0) ::_exit(NginxModeRecorder::GetMode() + 1);
  int status = 0;
  if (pid < 0 || ::waitpid(pid, &status, 0) != pid || !WIFEXITED(status)) return -100;
  return WEXITSTATUS(status) - 1;
}

// Alerts would fork: the flag keeps RecordMode from raising them here.
void SuppressAlerts() { WriteBytes("/run/tavow3/force_default", ""); }

TEST(NginxModeRecorder, RecordIsTheModeAsTextInA4096ByteObjectReadByAnotherProcess) {
  SuppressAlerts();
  const struct {
    NGINXCONF_TYPE mode;
    const char* text;
    int read_back;
  } cases[] = {
      {NGINXCONF_NORMAL, "0", 0},
      {NGINXCONF_ABNORMAL, "1", 1},
      {NGINXCONF_DEFAULT, "2", 2},
      {static_cast<NGINXCONF_TYPE>(10), "10", -1},
      {static_cast<NGINXCONF_TYPE>(-7), "-7", -1},
      {NGINXCONF_NORMAL, "0", 0},  // a shorter record after a longer one
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.text);
    EXPECT_TRUE(NginxModeRecorder::RecordMode(c.mode));
    EXPECT_EQ(Record(c.text), ReadBytes(kShmFile));
    struct stat st;
    ASSERT_EQ(0, ::stat(kShmFile, &st));
    EXPECT_EQ(0644u, st.st_mode & 07777);
    EXPECT_EQ(c.read_back, ModeInChild());
  }
}

TEST(NginxModeRecorder, RejectedRecordsReadAsMinusOne) {
  const struct {
    const char* name;
    std::string bytes;  // "" leaves the object missing
    int mode;
    std::vector<std::string> log;
  } cases[] = {
      {"missing object", "", -1,
       {"nginx_deploy:635 Failed to open share memory, No such file or directory"}},
      {"two characters", Record("10"), -1, {"nginx_deploy:650 Bad nginx mode record data"}},
      {"empty text", Record(""), -1, {"nginx_deploy:650 Bad nginx mode record data"}},
      {"digit 3", Record("3"), -1, {}},
      {"digit 9", Record("9"), -1, {}},
      {"letter", Record("a"), -1, {}},
      {"sign", Record("-"), -1, {}},
      {"text after the NUL is ignored", Record(std::string("2\0" "55", 4)), 2, {}},
      {"no NUL at all", std::string(kRecordSize, '1'), -1,
       {"nginx_deploy:650 Bad nginx mode record data"}},
      {"last byte is cut off", std::string(kRecordSize - 1, '\0') + "1", -1,
       {"nginx_deploy:650 Bad nginx mode record data"}},
      {"zero", Record("0"), 0, {}},
      {"one", Record("1"), 1, {}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    ::unlink(kShmFile);
    if (!c.bytes.empty()) WriteBytes(kShmFile, c.bytes);
    ClearLog();
    EXPECT_EQ(c.mode, NginxModeRecorder::GetMode());
    EXPECT_EQ(c.log, TaggedLogMessages("nginx_deploy"));
  }
}

// An object shorter than a record reads as its bytes followed by zeros; an
// empty one (another process between creating and sizing it) reads as no
// record, without a log line and without a fault.
TEST(NginxModeRecorder, ObjectShorterThanARecordReadsAsPadded) {
  const struct {
    std::string bytes;
    int mode;
    std::vector<std::string> log;
  } cases[] = {
      {"", -1, {}},
      {std::string("1\0", 2), 1, {}},
      {"2", 2, {}},
      {std::string(100, '\0'), -1, {"nginx_deploy:650 Bad nginx mode record data"}},
      {std::string(kRecordSize - 1, '\0'), -1, {"nginx_deploy:650 Bad nginx mode record data"}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.bytes.size());
    WriteBytes(kShmFile, c.bytes);
    ClearLog();
    EXPECT_EQ(c.mode, NginxModeRecorder::GetMode());
    EXPECT_EQ(c.log, TaggedLogMessages("nginx_deploy"));
  }
}

TEST(NginxModeRecorder, RecordingNoneWritesNothing) {
  ClearLog();
  EXPECT_TRUE(NginxModeRecorder::RecordMode(NGINXCONF_NONE));
  EXPECT_FALSE(PathExists(kShmFile));
  EXPECT_EQ(std::vector<std::string>{"nginx_deploy:719 Bad nginx mode to record"},
            TaggedLogMessages("nginx_deploy"));
  EXPECT_EQ(-1, NginxModeRecorder::GetMode());
}

TEST(NginxModeRecorder, FailuresAreLoggedAndStillReportSuccess) {
  using base::fault::Op;
  const struct {
    const char* name;
    Op op;
    std::string bytes_after;  // "<missing>": no object
    std::vector<std::string> log;
  } cases[] = {
      {"open", Op::kShmOpen, "<missing>",
       {"nginx_deploy:726 Failed to open share memory, Input/output error"}},
      {"truncate", Op::kTruncate, "", {"nginx_deploy:731 Failed to truncate shm file"}},
      {"map", Op::kMmap, std::string(kRecordSize, '\0'), {}},
      {"close", Op::kClose, Record("0"),
       {"nginx_deploy:755 Failed to close share memory, Input/output error"}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    ::unlink(kShmFile);
    ClearLog();
    {
      base::fault::Arm arm(1, base::fault::kOnce, EIO, c.op);
      EXPECT_TRUE(NginxModeRecorder::RecordMode(NGINXCONF_NORMAL));
      EXPECT_TRUE(arm.fired());
    }
    EXPECT_EQ(c.bytes_after, ReadBytes(kShmFile));
    EXPECT_EQ(c.log, TaggedLogMessages("nginx_deploy"));
  }
}

TEST(NginxModeRecorder, ReadFailuresGiveMinusOneOrKeepTheMode) {
  using base::fault::Op;
  ASSERT_TRUE(NginxModeRecorder::RecordMode(NGINXCONF_NORMAL));
  {
    ClearLog();
    base::fault::Arm arm(1, base::fault::kOnce, ENOMEM, Op::kMmap);
    EXPECT_EQ(-1, NginxModeRecorder::GetMode());
    EXPECT_TRUE(arm.fired());
    EXPECT_TRUE(TaggedLogMessages("nginx_deploy").empty());
  }
  {
    ClearLog();
    base::fault::Arm arm(1, base::fault::kOnce, EIO, Op::kClose);
    EXPECT_EQ(0, NginxModeRecorder::GetMode());
    EXPECT_TRUE(arm.fired());
    EXPECT_EQ(std::vector<std::string>{"nginx_deploy:671 Failed to close share memory, "
                                       "Input/output error"},
              TaggedLogMessages("nginx_deploy"));
  }
}

}  // namespace
}  // namespace tavow3::test
