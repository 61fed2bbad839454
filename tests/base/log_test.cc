#include "base/log.h"

#include <algorithm>
#include <cerrno>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "base/fault.h"
#include "support/syslog_capture.h"

namespace tavow3::base {
namespace {

constexpr char kLogTag[] = "base_test";

bool Contains(const std::vector<std::string>& lines, const std::string& line) {
  return std::find(lines.begin(), lines.end(), line) != lines.end();
}

TEST(Log, LineCarriesTagLineAndPriority) {
  test::ClearLog();
  Log(LOG_ERR, "engine", 317, "Runtime port %d conflict for %s", 80, "nginx");
  Log(LOG_WARNING, "zam", 5, "warned");
  TAVOW3_LOG_ERR_AT(687, "Failed to fork process, emit alert immediately");
  const int line = __LINE__ + 1;
  TAVOW3_LOG_ERR("real line");

  const std::vector<std::string> expected = {
      "engine:317 Runtime port 80 conflict for nginx",
      "zam:5 warned",
      "base_test:687 Failed to fork process, emit alert immediately",
      "base_test:" + std::to_string(line) + " real line",
  };
  EXPECT_EQ(expected, test::LogMessages());
  const std::vector<std::string> errors = test::LogMessages(LOG_ERR);
  EXPECT_TRUE(Contains(errors, "engine:317 Runtime port 80 conflict for nginx"));
  EXPECT_FALSE(Contains(errors, "zam:5 warned"));
  EXPECT_EQ(std::vector<std::string>{"zam:5 warned"}, test::LogMessages(LOG_WARNING));
}

TEST(Log, PercentMIsTheCallersErrnoAndErrnoSurvives) {
  test::ClearLog();
  for (int error : {ENOENT, EACCES, ENOSPC}) {
    SCOPED_TRACE(error);
    errno = error;
    TAVOW3_LOG_ERR_AT(1, "cannot store %s: %m", "/tmp/x");
    EXPECT_EQ(error, errno);
  }
  EXPECT_EQ((std::vector<std::string>{
                "base_test:1 cannot store /tmp/x: No such file or directory",
                "base_test:1 cannot store /tmp/x: Permission denied",
                "base_test:1 cannot store /tmp/x: No space left on device"}),
            test::LogMessages(LOG_ERR));

  // A long message is cut, not overrun; the prefix stays.
  test::ClearLog();
  TAVOW3_LOG_ERR_AT(2, "%s", std::string(5000, 'y').c_str());
  const std::vector<std::string> lines = test::LogMessages(LOG_ERR);
  ASSERT_EQ(1u, lines.size());
  EXPECT_EQ(0u, lines[0].rfind("base_test:2 yyyy", 0));
  EXPECT_LT(lines[0].size(), 2048u);
}

TEST(Log, FailedSyslogKeepsErrno) {
  test::ClearLog();
  {
    fault::Arm arm(1, fault::kOnce, EIO, fault::Op::kSyslog);
    errno = EACCES;
    TAVOW3_LOG_ERR_AT(3, "dropped");
    EXPECT_EQ(EACCES, errno);
    EXPECT_TRUE(arm.fired());
  }
  TAVOW3_LOG_ERR_AT(4, "kept");
  EXPECT_EQ(std::vector<std::string>{"base_test:4 kept"}, test::LogMessages());
}

}  // namespace
}  // namespace tavow3::base
