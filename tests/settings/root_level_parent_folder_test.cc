// The parent folder of a path is everything before its last "/": for a file
// directly below "/" that is the empty name, which the platform refuses.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include <tavow3/w3base.h>

#include "support/syslog_capture.h"

namespace tavow3 {
namespace {

using test::HasLogMatching;
using test::LogMessages;

TEST(MakeParentFolderExist, PathDirectlyBelowTheRootHasAnEmptyParent) {
  struct Case {
    const char* path;
    bool ok;
    const char* log;  // the line expected, or null for none
  };
  const Case cases[] = {
      {"/w3root.json", false,
       "tavow3\\.cpp:\\d+ make directory exist failed \\(, Invalid argument\\)"},
      {"/var/tmp/w3root/a.json", true, nullptr},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.path);
    test::ClearLog();
    EXPECT_EQ(c.ok, W3Base::MakeParentFolderExist(c.path));
    const std::vector<std::string> log = LogMessages();
    if (c.log == nullptr) {
      EXPECT_TRUE(log.empty()) << log.front();
    } else {
      EXPECT_EQ(1u, log.size());
      EXPECT_TRUE(HasLogMatching(log, c.log)) << (log.empty() ? "" : log.front());
    }
  }
}

}  // namespace
}  // namespace tavow3
