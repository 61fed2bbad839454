// Firewall service file generation: the tool's input document, the installed
// files and the failure paths.
#include <sys/mount.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "base/fault.h"
#include "engine/engine_private.h"
#include "support/syslog_capture.h"
#include "support/test_engine.h"
#include "support/test_files.h"
#include "support/test_mounts.h"

namespace tavow3::test {
namespace {

using S = FQDNPortSchemaResource;

constexpr char kDocument[] = "/var/tmp/tavow3/Firewall.json";
constexpr char kSystemFile[] = "/usr/tavo/etc/services.d/tavow3.sc";
constexpr char kPackageFile[] = "/usr/local/etc/services.d/Pagora.sc";
constexpr char kSystemBackup[] = "/var/tmp/tavow3/tavow3.sc";
constexpr char kTemplate[] = "/usr/tavo/share/nginx/Firewall.mustache";
constexpr char kOld[] = "[old]\nports=\"1\"\n";

// Joined lists follow no fixed order: compare them as sorted lists, and the
// sections in port order.
Json::Value Normalised(Json::Value sections) {
  std::vector<Json::Value> items(sections.begin(), sections.end());
  std::sort(items.begin(), items.end(), [](const Json::Value& a, const Json::Value& b) {
    return a["port"].asUInt() < b["port"].asUInt();
  });
  Json::Value result(Json::arrayValue);
  for (Json::Value item : items) {
    for (const char* key : {"desc_key", "desc", "desc_extra"}) {
      if (!item.isMember(key)) continue;
      std::vector<std::string> parts;
      std::string text = item[key].asString();
      for (size_t start = 0;;) {
        const size_t comma = text.find(", ", start);
        parts.push_back(text.substr(start, comma - start));
        if (comma == std::string::npos) break;
        start = comma + 2;
      }
      std::sort(parts.begin(), parts.end());
      std::string joined;
      for (const std::string& part : parts) joined += (joined.empty() ? "" : ", ") + part;
      item[key] = joined;
    }
    result.append(item);
  }
  return result;
}

struct DocumentCase {
  const char* name;
  const char* owner;
  std::function<void(Engine&)> setup;
  const char* sections;  // the expected "sections" array
};

TEST(GenerateFirewallConfig, WritesOneSectionPerPortOfTheOwner) {
  const std::vector<DocumentCase> cases = {
      {"mixed protocols on one port", "tavow3",
       [](Engine& e) {
         Register(e, 8080, S::HTTP, "tavow3", "a.example", "", "", "", "", 0);
         Register(e, 8080, S::HTTP, "tavow3", "b.example", "", "", "", "", 1);
       },
       R"([{"port":8080,"section":"ReverseProxy_8080","title":"HTTP","protocol":"udp,tcp"}])"},
      {"one protocol per port, unknown protocol omitted", "tavow3",
       [](Engine& e) {
         Register(e, 81, S::HTTP, "tavow3", "a", "", "", "", "", 1);
         Register(e, 81, S::HTTP, "tavow3", "b", "", "", "", "", 1);
         Register(e, 82, S::HTTP, "tavow3", "", "", "", "", "", 2);
         Register(e, 83, S::HTTP, "tavow3", "", "", "", "", "", 7);
       },
       R"([{"port":81,"section":"ReverseProxy_81","title":"HTTP","protocol":"udp"},
           {"port":82,"section":"ReverseProxy_82","title":"HTTP","protocol":"udp,tcp"},
           {"port":83,"section":"ReverseProxy_83","title":"HTTP"}])"},
      {"keyed and plain descriptions", "tavow3",
       [](Engine& e) {
         Register(e, 8443, S::HTTPS, "tavow3", "a", "", "", "A", "K");
         Register(e, 8443, S::HTTPS, "tavow3", "b", "", "", "B", "");
         Register(e, 8443, S::HTTPS, "tavow3", "c", "", "", "A", "K");
         Register(e, 9000, S::HTTP, "tavow3", "", "", "", "", "K2");
         Register(e, 9443, S::HTTPS, "tavow3", "a", "", "", "X", "K1");
         Register(e, 9443, S::HTTPS, "tavow3", "b", "", "", "Y", "K2");
         Register(e, 9443, S::HTTPS, "tavow3", "c", "", "", "Z", "");
       },
       R"([{"port":8443,"section":"ReverseProxy_8443","title":"HTTPS","protocol":"tcp",
            "desc_key":"K","desc":"A","desc_extra":"B"},
           {"port":9000,"section":"ReverseProxy_9000","title":"HTTP","protocol":"tcp",
            "desc_key":"K2"},
           {"port":9443,"section":"ReverseProxy_9443","title":"HTTPS","protocol":"tcp",
            "desc_key":"K1, K2","desc":"X, Y","desc_extra":"Z"}])"},
      {"plain descriptions only", "tavow3",
       [](Engine& e) {
         Register(e, 8080, S::HTTP, "tavow3", "a", "", "", "A");
         Register(e, 8080, S::HTTP, "tavow3", "b", "", "", "B");
         Register(e, 8080, S::HTTP, "tavow3", "c", "", "", "");
       },
       R"([{"port":8080,"section":"ReverseProxy_8080","title":"HTTP","protocol":"tcp",
            "desc":"A, B"}])"},
      {"given section names and title keys", "tavow3",
       [](Engine& e) {
         Register(e, 443, S::HTTPS, "tavow3", "a", "", "opt_a");
         Register(e, 443, S::HTTPS, "tavow3", "b", "https_main", "");
         Register(e, 8080, S::HTTP, "tavow3", "", "http_extra", "opt_extra");
       },
       R"([{"port":443,"section":"https_main","title":"HTTPS","title_key":"opt_a",
            "protocol":"tcp"},
           {"port":8080,"section":"http_extra","title":"HTTP","title_key":"opt_extra",
            "protocol":"tcp"}])"},
      {"package owner among system resources", "Pagora",
       [](Engine& e) {
         Register(e, 80, S::HTTP, "tavow3");
         Register(e, 8080, S::HTTP, "Pagora", "", "", "", "Pagora", "desc_web");
         Register(e, 8081, S::HTTPS, "Pagora", "", "web_https");
       },
       R"([{"port":8080,"section":"VirtualHost_8080","title":"HTTP","protocol":"tcp",
            "desc_key":"desc_web","desc":"Pagora"},
           {"port":8081,"section":"web_https","title":"HTTPS","protocol":"tcp"}])"},
  };
  for (const DocumentCase& c : cases) {
    SCOPED_TRACE(c.name);
    Engine engine = LoadedEngine();
    c.setup(engine);
    ASSERT_TRUE(engine.GenerateFirewallConfig(c.owner));
    const Json::Value document = ReadJson(kDocument);
    ASSERT_EQ(std::vector<std::string>{"sections"}, document.getMemberNames());
    EXPECT_EQ(Normalised(ParseJson(c.sections)), Normalised(document["sections"]))
        << ReadBytes(kDocument);
    const std::string installed = std::string(c.owner) == "tavow3" ? kSystemFile : kPackageFile;
    EXPECT_EQ(ReadBytes("/var/tmp/tavow3/temp.sc"), ReadBytes(installed));
  }
}

TEST(GenerateFirewallConfig, LastGivenSectionNameAndTitleKeyWin) {
  Engine engine = LoadedEngine();
  Register(engine, 8080, S::HTTP, "tavow3", "a", "first", "key_a");
  Register(engine, 8080, S::HTTP, "tavow3", "b", "", "");
  Register(engine, 8080, S::HTTP, "tavow3", "c", "third", "key_c");
  // "Last" is the registry's iteration order, which the hash table decides.
  std::string section, title_key;
  for (const auto& entry : engine.impl().fqdn_resources) {
    if (!entry.second.section.empty()) section = entry.second.section;
    if (!entry.second.title_key.empty()) title_key = entry.second.title_key;
  }
  ASSERT_TRUE(engine.GenerateFirewallConfig("tavow3"));
  const Json::Value sections = ReadJson(kDocument)["sections"];
  ASSERT_EQ(1u, sections.size());
  EXPECT_EQ(section, sections[0]["section"].asString());
  EXPECT_EQ(title_key, sections[0]["title_key"].asString());
}

TEST(GenerateFirewallConfig, OwnerWithoutResourcesHasNoFile) {
  for (const char* owner : {"tavow3", "Pagora"}) {
    SCOPED_TRACE(owner);
    const std::string installed = std::string(owner) == "tavow3" ? kSystemFile : kPackageFile;
    WriteBytes(installed, "[old]\nports=\"1\"\n");
    Engine engine = LoadedEngine();
    Register(engine, 8080, S::HTTP, std::string(owner) == "tavow3" ? "Pagora" : "tavow3");
    EXPECT_TRUE(engine.GenerateFirewallConfig(owner));
    EXPECT_FALSE(PathExists(installed));
    EXPECT_TRUE(engine.GenerateFirewallConfig(owner)) << "a missing file is no error";
    EXPECT_TRUE(DirNames("/var/tmp/tavow3").empty()) << "no work file for an owner without resources";
  }
  WriteBytes(kSystemFile, "[old]\n");
  EXPECT_EQ(1, LoadedEngine().W3FwReGenAll());
  EXPECT_FALSE(PathExists(kSystemFile));

  // The deletion's own result decides nothing: true and silent even when the
  // file cannot be removed.
  WriteBytes(kPackageFile, kOld);
  ASSERT_TRUE(BindReadOnly("/usr/local/etc/services.d"));
  ClearLog();
  EXPECT_TRUE(LoadedEngine().GenerateFirewallConfig("Pagora"));
  EXPECT_EQ(kOld, ReadBytes(kPackageFile));
  EXPECT_EQ(std::vector<std::string>{}, LogMessages(LOG_ERR));
}

struct FailureCase {
  const char* name;
  std::function<void()> break_it;
  const char* log_line;
};

TEST(GenerateFirewallConfig, FailureLeavesInstalledFileAndLogs) {
  const std::vector<FailureCase> cases = {
      {"broken template", [] { WriteBytes(kTemplate, "{{#sections}}\n"); },
       "engine:361 Fail to generate sc file through mustache"},
      {"work directory cannot be made",
       [] {
         std::filesystem::remove_all("/var/tmp/tavow3");
         ASSERT_TRUE(BindReadOnly("/var/tmp"));
       },
       "engine:344 make directory /var/tmp/tavow3 failed"},
      {"staging directory cannot be made",
       [] {
         std::filesystem::create_directories("/var/tmp/tavow3");
         std::filesystem::remove_all("/var/tmp/nginx");
         ASSERT_TRUE(BindReadOnly("/var/tmp"));
       },
       "engine:349 make directory /var/tmp/nginx failed"},
      {"document cannot be written", [] { ASSERT_TRUE(BindReadOnly("/var/tmp/tavow3")); },
       "engine:356 Fail to write temp sc file"},
      {"install copy fails", [] { ASSERT_TRUE(BindReadOnly("/usr/tavo/etc/services.d")); },
       "engine:409 Fail to move file from /var/tmp/tavow3/temp.sc to "
       "/usr/tavo/etc/services.d/tavow3.sc"},
      // Last: the tool stays removed.
      {"mustache tool missing", [] { ASSERT_EQ(0, ::unlink("/usr/tavo/bin/tavomustache")); },
       "engine:361 Fail to generate sc file through mustache"},
  };
  for (const FailureCase& c : cases) {
    SCOPED_TRACE(c.name);
    for (const char* mount : {"/var/tmp/tavow3", "/var/tmp", "/usr/tavo/etc/services.d"}) {
      (void)::umount2(mount, MNT_DETACH);
    }
    WriteBytes(kSystemFile, kOld);
    const std::string template_text = ReadBytes(kTemplate);
    Engine engine = LoadedEngine();
    Register(engine, 8080, S::HTTP, "tavow3");
    ClearLog();
    c.break_it();
    EXPECT_FALSE(engine.GenerateFirewallConfig("tavow3"));
    EXPECT_EQ(kOld, ReadBytes(kSystemFile));
    const std::vector<std::string> log = LogMessages(LOG_ERR);
    EXPECT_EQ(std::vector<std::string>{c.log_line}, log);
    WriteBytes(kTemplate, template_text);
  }
}

TEST(GenerateFirewallConfig, InstallFailureKeepsBackupOfPreviousFile) {
  WriteBytes(kSystemFile, kOld);
  Engine engine = LoadedEngine();
  Register(engine, 8080, S::HTTP, "tavow3");
  ASSERT_TRUE(BindReadOnly("/usr/tavo/etc/services.d"));
  EXPECT_FALSE(engine.GenerateFirewallConfig("tavow3"));
  EXPECT_EQ(kOld, ReadBytes(kSystemBackup));
}

TEST(GenerateFirewallConfig, ServiceDirectoryThatCannotBeMadeFails) {
  const struct {
    const char* owner;
    const char* dir;
    const char* read_only;
    const char* log_line;
  } cases[] = {
      {"Pagora", "/usr/local/etc/services.d", "/usr/local/etc",
       "engine:381 make directory /usr/local/etc/services.d failed"},
      {"tavow3", "/usr/tavo/etc/services.d", "/usr/tavo/etc",
       "engine:375 make directory /usr/tavo/etc/services.d failed"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.owner);
    Engine engine = LoadedEngine();
    Register(engine, 8080, S::HTTP, c.owner);
    RemoveTree(c.dir);
    ASSERT_TRUE(BindReadOnly(c.read_only));
    ClearLog();
    EXPECT_FALSE(engine.GenerateFirewallConfig(c.owner));
    EXPECT_EQ(std::vector<std::string>{c.log_line}, LogMessages(LOG_ERR));
    EXPECT_FALSE(PathExists(std::string(c.dir) + "/" + c.owner + ".sc"));
  }
}

TEST(GenerateFirewallConfig, BackupFailureIsOnlyLogged) {
  WriteBytes(kSystemFile, kOld);
  std::filesystem::create_directories(std::string(kSystemBackup) + "/in-the-way");
  Engine engine = LoadedEngine();
  Register(engine, 8080, S::HTTP, "tavow3");
  ClearLog();
  EXPECT_TRUE(engine.GenerateFirewallConfig("tavow3"));
  EXPECT_EQ(std::vector<std::string>{"engine:405 Fail to move file from "
                                     "/usr/tavo/etc/services.d/tavow3.sc to "
                                     "/var/tmp/tavow3/tavow3.sc"},
            LogMessages(LOG_ERR));
  EXPECT_EQ(ReadBytes("/var/tmp/tavow3/temp.sc"), ReadBytes(kSystemFile));
}

TEST(GenerateFirewallConfig, SuccessiveRunsBackUpTheInstalledFile) {
  Engine first = LoadedEngine();
  Register(first, 8080, S::HTTP, "tavow3");
  ASSERT_TRUE(first.GenerateFirewallConfig("tavow3"));
  EXPECT_FALSE(PathExists(kSystemBackup)) << "nothing was installed before";
  const std::string first_file = ReadBytes(kSystemFile);
  Engine second = LoadedEngine();
  Register(second, 8081, S::HTTP, "tavow3");
  ASSERT_TRUE(second.GenerateFirewallConfig("tavow3"));
  EXPECT_EQ(first_file, ReadBytes(kSystemBackup));
  EXPECT_NE(first_file, ReadBytes(kSystemFile));
  struct stat st;
  ASSERT_EQ(0, ::stat(kSystemFile, &st));
  EXPECT_EQ(0644u, st.st_mode & 07777);
}

TEST(GenerateFirewallConfig, FaultAtEveryLibraryCallKeepsInstalledFileWhole) {
  namespace fault = base::fault;
  Engine engine = LoadedEngine();
  Register(engine, 8080, S::HTTP, "tavow3");
  ASSERT_TRUE(engine.GenerateFirewallConfig("tavow3"));
  const std::string fresh = ReadBytes(kSystemFile);
  int n = 1;
  for (;; ++n) {
    SCOPED_TRACE(testing::Message() << "call " << n);
    WriteBytes(kSystemFile, kOld);
    bool ok, fired;
    {
      fault::Arm arm(n, fault::kOnce, EIO);
      ok = engine.GenerateFirewallConfig("tavow3");
      fired = arm.fired();
    }
    if (!fired) {
      EXPECT_TRUE(ok);
      break;
    }
    EXPECT_EQ(ok ? fresh : std::string(kOld), ReadBytes(kSystemFile));
  }
  EXPECT_GE(n - 1, 6) << "the document's write and the mode change are fault points";
}

TEST(GenerateFirewallConfig, ChmodFailureIsLogged) {
  namespace fault = base::fault;
  Engine engine = LoadedEngine();
  Register(engine, 8080, S::HTTP, "tavow3");
  const std::string line =
      "engine:366 Fail to chmod file (/var/tmp/tavow3/temp.sc, Operation not permitted)";
  int logged = 0;
  for (int n = 1;; ++n) {
    SCOPED_TRACE(testing::Message() << "mode change " << n);
    WriteBytes(kSystemFile, kOld);
    ClearLog();
    bool ok, fired;
    {
      fault::Arm arm(n, fault::kOnce, EPERM, fault::Op::kChmod);
      ok = engine.GenerateFirewallConfig("tavow3");
      fired = arm.fired();
    }
    if (!fired) break;
    if (LogMessages(LOG_ERR) == std::vector<std::string>{line}) {
      ++logged;
      EXPECT_FALSE(ok);
      EXPECT_EQ(kOld, ReadBytes(kSystemFile));
    }
  }
  EXPECT_EQ(1, logged);
}

}  // namespace
}  // namespace tavow3::test
