// The general web service's staging file is owned like every settings file.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <tavow3/engine.h>
#include <tavow3/wwwservice.h>

#include "support/test_files.h"

namespace tavow3 {
namespace {

constexpr char kStored[] = "/usr/tavo/etc/www/WWWService.json";
constexpr char kStaging[] = "/var/tmp/nginx/WWWService.json";

TEST(WWWService, StagingFileHasOwnerOneAndMode0644) {
  const std::string stored = "{\"additionalPort\": {\"http\": 8081}}";
  test::WriteBytes(kStored, stored);
  // A staging file left by root is replaced, not rewritten in place.
  test::WriteBytes(kStaging, "{}", 0600);
  const ino_t old_inode = test::InodeOf(kStaging);
  Engine engine;
  WWWService www(engine);
  Json::Value value;
  ASSERT_TRUE(www.TransVarToJson(value));
  ASSERT_TRUE(www.SetJson(value));
  EXPECT_EQ(value, test::ReadJson(kStaging));
  struct stat st;
  ASSERT_EQ(0, ::stat(kStaging, &st));
  EXPECT_EQ(1u, st.st_uid);
  EXPECT_EQ(1u, st.st_gid);
  EXPECT_EQ(0644u, st.st_mode & 07777);
  EXPECT_NE(old_inode, st.st_ino);
  EXPECT_EQ(stored, test::ReadBytes(kStored));
}

}  // namespace
}  // namespace tavow3
