// The temporary name of a settings file is formatted into 1,024 bytes: a path
// whose pattern does not fit loses the pattern's X's, so mkstemp refuses it.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include <tavow3/w3base.h>

#include "support/syslog_capture.h"
#include "support/test_files.h"

namespace tavow3 {
namespace {

using test::DirNames;
using test::HasLogMatching;
using test::LogMessages;
using test::ReadBytes;
using test::WriteBytes;

constexpr char kDir[] = "/var/tmp/w3long";
constexpr char kSource[] = "/var/tmp/w3long-source.json";
constexpr char kCreateFailed[] = "tavow3\\.cpp:\\d+ Fail to create temp file \\(.*\\)";

// A path of exactly `length` bytes below kDir, in components short enough for
// the file system.
std::string PathOfLength(size_t length) {
  std::string path = kDir;
  while (length - path.size() > 200) path += "/" + std::string(150, 'd');
  path += "/" + std::string(length - path.size() - 1, 'f');
  return path;
}

std::string Folder(const std::string& path) { return path.substr(0, path.rfind('/')); }
std::string Name(const std::string& path) { return path.substr(path.rfind('/') + 1); }

// 1,016 bytes + ".XXXXXX" fill the buffer but for its terminator; one byte
// more cuts the last X.
TEST(WriteJsonFile, TemporaryNameThatDoesNotFitIsLoggedAndTheWriteGoesOn) {
  for (size_t length : {1016u, 1017u}) {
    SCOPED_TRACE(length);
    test::RemoveTree(kDir);
    const std::string path = PathOfLength(length);
    ASSERT_EQ(length, path.size());
    Json::Value value;
    value["port"] = 5001;
    test::ClearLog();
    EXPECT_TRUE(W3Base::WriteJsonFile(path, value));
    const std::vector<std::string> log = LogMessages();
    EXPECT_EQ(length > 1016, HasLogMatching(log, kCreateFailed));
    EXPECT_EQ(length > 1016,
              HasLogMatching(log, "tavow3\\.cpp:\\d+ Fail to create temp file \\(" + path +
                                      ", Invalid argument\\)"));
    EXPECT_EQ(value, test::ParseJson(ReadBytes(path)));
    // The cut name was renamed into place like a made one.
    EXPECT_EQ(std::vector<std::string>{Name(path)}, DirNames(Folder(path)));
  }
}

TEST(MoveFile, TemporaryNameThatDoesNotFitFailsTheMoveAndLosesTheSource) {
  for (size_t length : {1016u, 1017u}) {
    SCOPED_TRACE(length);
    test::RemoveTree(kDir);
    const std::string to = PathOfLength(length);
    WriteBytes(kSource, "{\"port\": 5001}\n");
    test::ClearLog();
    const bool fits = length == 1016;
    EXPECT_EQ(fits, W3Base::MoveFile(kSource, to));
    EXPECT_EQ(!fits, HasLogMatching(LogMessages(), kCreateFailed));
    EXPECT_FALSE(test::PathExists(kSource));
    EXPECT_EQ(fits ? "{\"port\": 5001}\n" : "<missing>", ReadBytes(to));
    EXPECT_EQ(fits ? std::vector<std::string>{Name(to)} : std::vector<std::string>{},
              DirNames(Folder(to)));
  }
}

}  // namespace
}  // namespace tavow3
