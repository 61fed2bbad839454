#include "base/dynamic_library.h"

#include <dlfcn.h>

#include <cerrno>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "base/fault.h"
#include "support/test_files.h"

namespace tavow3::base {
namespace {

bool StillLoaded(const char* path) {
  void* handle = ::dlopen(path, RTLD_LAZY | RTLD_NOLOAD);
  if (handle == nullptr) return false;
  ::dlclose(handle);
  return true;
}

TEST(LoadLibraryOnce, ClosesAtOnceUnlessNodelete) {
  std::string error = "untouched";
  ASSERT_TRUE(LoadLibraryOnce(TAVOW3_TEST_MODULE, RTLD_NOW, &error));
  EXPECT_EQ("untouched", error);
  EXPECT_FALSE(StillLoaded(TAVOW3_TEST_MODULE));

  ASSERT_TRUE(LoadLibraryOnce(TAVOW3_TEST_MODULE, RTLD_NOW | RTLD_NODELETE, &error));
  EXPECT_TRUE(StillLoaded(TAVOW3_TEST_MODULE));
}

TEST(LoadLibraryOnce, ReportsTheLoadersMessage) {
  test::FreshDir("/tmp/dl");
  test::WriteBytes("/tmp/dl/text.so", std::string(200, 'x'));
  struct Case {
    std::string path;
    int flags;
    std::string message;
  };
  const std::vector<Case> cases = {
      {"/tmp/dl/missing.so", RTLD_NOW, "/tmp/dl/missing.so: cannot open shared object file"},
      {"/tmp/dl/text.so", RTLD_NOW, "/tmp/dl/text.so: invalid ELF header"},
      {TAVOW3_TEST_MODULE_UNDEFINED, RTLD_NOW, "undefined symbol: tavow3_test_missing_function"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.path);
    std::string error;
    EXPECT_FALSE(LoadLibraryOnce(c.path, c.flags, &error));
    EXPECT_NE(std::string::npos, error.find(c.message)) << error;
  }
  // Lazy binding leaves the missing function to its first call.
  std::string error = "untouched";
  EXPECT_TRUE(LoadLibraryOnce(TAVOW3_TEST_MODULE_UNDEFINED, RTLD_LAZY, &error)) << error;
  EXPECT_EQ("untouched", error);

  fault::Arm arm(1, fault::kOnce, EIO, fault::Op::kDlopen);
  EXPECT_FALSE(LoadLibraryOnce(TAVOW3_TEST_MODULE, RTLD_NOW, &error));
  EXPECT_TRUE(arm.fired());
  EXPECT_NE(std::string::npos, error.find(TAVOW3_TEST_MODULE)) << error;
}

}  // namespace
}  // namespace tavow3::base
