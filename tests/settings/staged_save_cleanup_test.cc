// What a failed staged save removes. ZAM and WWWService drop the temporary
// nginx configuration on opposite branches: WWWService when Update() fails,
// ZAM when the final move fails. Both always drop the scratch and staging
// files and leave the stored file as it was.
#include <gtest/gtest.h>

#include <functional>
#include <optional>
#include <string>

#include <tavow3/engine.h>
#include <tavow3/wwwservice.h>
#include <tavow3/zam.h>

#include "support/syslog_capture.h"
#include "support/test_files.h"
#include "support/test_mounts.h"

namespace tavow3 {
namespace {

using test::PathExists;
using test::ReadBytes;
using test::WriteBytes;

constexpr char kTempConf[] = "/var/tmp/nginx/nginx.conf";
constexpr char kTemplate[] = "/usr/tavo/share/nginx/Firewall.mustache";
constexpr char kFirewallFile[] = "/usr/tavo/etc/services.d/tavow3.sc";
constexpr char kSettingsDir[] = "/usr/tavo/etc/www";

enum class Failure {
  kUpdate,  // the configuration is generated, the firewall file cannot be rendered
  kMove,    // Update() succeeds, the stored file's folder is read-only
};

struct Case {
  const char* name;
  const char* stored;
  const char* staging;
  const char* scratch;
  const char* content;
  std::function<bool(Engine&)> save;
  Failure failure;
  bool keeps_conf;
};

bool SaveZAM(Engine& engine) { return ZAM(engine).Save(); }
bool SaveWWWService(Engine& engine) { return WWWService(engine).Save(); }

TEST(StagedSave, FailureBranchesRemoveTheirFiles) {
  constexpr char kZAMStored[] = "/usr/tavo/etc/www/ZAM.json";
  constexpr char kZAMStaging[] = "/var/tmp/nginx/ZAM.json";
  constexpr char kZAMScratch[] = "/var/tmp/nginx/ZAM.tmp";
  constexpr char kZAMContent[] = "{\"port\": 5000, \"ssl\": {\"port\": 5001}}";
  constexpr char kWWWStored[] = "/usr/tavo/etc/www/WWWService.json";
  constexpr char kWWWStaging[] = "/var/tmp/nginx/WWWService.json";
  constexpr char kWWWScratch[] = "/var/tmp/nginx/WWWService.tmp";
  constexpr char kWWWContent[] = "{\"additionalPort\": {\"http\": 8081}}";
  const Case cases[] = {
      {"ZAM, update fails", kZAMStored, kZAMStaging, kZAMScratch, kZAMContent, SaveZAM,
       Failure::kUpdate, true},
      {"ZAM, move fails", kZAMStored, kZAMStaging, kZAMScratch, kZAMContent, SaveZAM,
       Failure::kMove, false},
      {"WWWService, update fails", kWWWStored, kWWWStaging, kWWWScratch, kWWWContent,
       SaveWWWService, Failure::kUpdate, false},
      {"WWWService, move fails", kWWWStored, kWWWStaging, kWWWScratch, kWWWContent,
       SaveWWWService, Failure::kMove, true},
  };
  const std::string good_template = ReadBytes(kTemplate);
  ASSERT_NE("<missing>", good_template);
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    WriteBytes(c.stored, c.content);
    WriteBytes(c.scratch, "scratch");
    test::RemoveTree(kTempConf);
    test::RemoveTree(kFirewallFile);
    WriteBytes(kTemplate, c.failure == Failure::kUpdate ? "{{#sections}}unclosed\n" : good_template);
    std::optional<test::ScopedMount> read_only;
    if (c.failure == Failure::kMove) {
      read_only.emplace(test::ScopedMount::ReadOnly(kSettingsDir));
      ASSERT_TRUE(read_only->ok());
    }
    test::ClearLog();
    Engine engine;
    EXPECT_FALSE(c.save(engine));
    // Which step failed: the generated configuration was accepted in both
    // branches, and only the move branch got as far as the firewall file.
    EXPECT_EQ(c.failure == Failure::kUpdate,
              test::HasLogMatching(test::LogMessages(),
                                   "engine:361 Fail to generate sc file through mustache"));
    EXPECT_EQ(c.failure == Failure::kMove, PathExists(kFirewallFile));
    EXPECT_EQ(c.keeps_conf, PathExists(kTempConf));
    EXPECT_FALSE(PathExists(c.scratch));
    EXPECT_FALSE(PathExists(c.staging));
    EXPECT_EQ(c.content, ReadBytes(c.stored));
  }
}

}  // namespace
}  // namespace tavow3
