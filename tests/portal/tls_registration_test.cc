// TLS-profile and certificate registration against the real TLS store and the
// fake certificate tools.
#include <tavow3/tls_registration.h>

#include <gtest/gtest.h>
#include <json/json.h>
#include <sys/stat.h>
#include <tavo/tavotls.h>
#include <unistd.h>

#include <functional>
#include <string>
#include <vector>

#include "base/fault.h"
#include "support/fake_tools.h"
#include "support/test_files.h"
#include "support/test_mounts.h"

namespace tavow3 {
namespace {

using test::FakeCalls;
using test::ParseJson;
using test::ReadBytes;
using test::SetFakeExit;
using test::WriteBytes;
using Argvs = std::vector<std::vector<std::string>>;

constexpr char kStoreDir[] = "/usr/tavo/etc/tls";
constexpr char kServiceDir[] = "/usr/tavo/share/certificate.d";
constexpr char kServiceFile[] = "/usr/tavo/share/certificate.d/AppPortal.cfg";
constexpr char kCertificateDir[] = "/usr/tavo/etc/certificate/AppPortal/photo";

std::vector<std::string> Members(const Json::Value& object) {
  return object.isObject() ? object.getMemberNames() : std::vector<std::string>{"<not an object>"};
}

TEST(RegisterTLSProfile, JoinsUnderTheJoinedNameWithHyphenatedKeys) {
  ASSERT_TRUE(RegisterTLSProfile("AppPortal", "photo", "photo - www.example.com", ""));
  ASSERT_TRUE(RegisterTLSProfile("AppPortal", "photo_AltPort", "photo - 8443", "app:photo_title"));
  Json::Value services = tavotls::DataStoreProvider::list_services();
  EXPECT_EQ((std::vector<std::string>{"AppPortal_photo", "AppPortal_photo_AltPort", "zam"}),
            Members(services));
  EXPECT_EQ("photo - www.example.com", services["AppPortal_photo"]["display-name"].asString());
  EXPECT_EQ("", services["AppPortal_photo"].get("display-name-i18n", "").asString());
  EXPECT_EQ("photo - 8443", services["AppPortal_photo_AltPort"]["display-name"].asString());
  EXPECT_EQ("app:photo_title",
            services["AppPortal_photo_AltPort"]["display-name-i18n"].asString());

  // Registering again updates the entry.
  ASSERT_TRUE(RegisterTLSProfile("AppPortal", "photo", "photo - photos.example.com", ""));
  services = tavotls::DataStoreProvider::list_services();
  EXPECT_EQ("photo - photos.example.com", services["AppPortal_photo"]["display-name"].asString());
  EXPECT_EQ(3u, services.size());
}

TEST(UnregisterTLSProfile, RemovesOnlyThatService) {
  ASSERT_TRUE(RegisterTLSProfile("AppPortal", "photo", "photo - a", ""));
  ASSERT_TRUE(RegisterTLSProfile("AppPortal", "photo_AltPort", "photo - 8443", ""));
  EXPECT_TRUE(UnregisterTLSProfile("AppPortal", "photo"));
  EXPECT_EQ((std::vector<std::string>{"AppPortal_photo_AltPort", "zam"}),
            Members(tavotls::DataStoreProvider::list_services()));
  EXPECT_TRUE(UnregisterTLSProfile("AppPortal", "photo"));  // already gone
  EXPECT_EQ((std::vector<std::string>{"AppPortal_photo_AltPort", "zam"}),
            Members(tavotls::DataStoreProvider::list_services()));
}

// With the store read-only every framework call fails, so success proves
// that no call was made; the store's bytes stay as they were.
TEST(UnregisterTLSProfile, UnknownServiceDoesNotCallTheFramework) {
  ASSERT_TRUE(RegisterTLSProfile("AppPortal", "photo", "photo - a", ""));
  const std::string store_path = std::string(kStoreDir) + "/services.json";
  const std::string before = ReadBytes(store_path);
  ASSERT_NE("<missing>", before);
  ASSERT_TRUE(test::BindReadOnly(kStoreDir));

  EXPECT_TRUE(UnregisterTLSProfile("AppPortal", "video"));
  EXPECT_TRUE(UnregisterTLSProfile("AppPortal_photo", ""));
  EXPECT_TRUE(UnregisterTLSProfile("", "AppPortal_photo"));
  EXPECT_EQ(before, ReadBytes(store_path));

  // The same store refuses a real removal and a registration.
  EXPECT_FALSE(UnregisterTLSProfile("AppPortal", "photo"));
  EXPECT_FALSE(RegisterTLSProfile("AppPortal", "video", "video - b", ""));
  EXPECT_EQ(before, ReadBytes(store_path));
}

TEST(RegisterCertificate, WritesTheServiceFileAndRunsTheTool) {
  ASSERT_TRUE(RegisterCertificate("AppPortal", "photo", "photo - www.example.com", ""));
  EXPECT_EQ((Argvs{{"AppPortal", "photo"}}), FakeCalls("tavocrtregister"));

  const std::string bytes = ReadBytes(kServiceFile);
  EXPECT_NE(std::string::npos, bytes.find("\n   \"")) << "not styled: " << bytes;
  EXPECT_EQ('\n', bytes.back());
  Json::Value document = ParseJson(bytes);
  EXPECT_EQ((std::vector<std::string>{"isPkg", "owner", "services"}), Members(document));
  EXPECT_EQ(Json::Value(false), document["isPkg"]);
  EXPECT_EQ(Json::Value("root"), document["owner"]);
  ASSERT_TRUE(document["services"].isArray());
  ASSERT_EQ(1u, document["services"].size());
  const Json::Value& entry = document["services"][0];
  EXPECT_EQ((std::vector<std::string>{"display_name", "service"}), Members(entry));
  EXPECT_EQ("photo - www.example.com", entry["display_name"].asString());
  EXPECT_EQ("photo", entry["service"].asString());

  struct stat st;
  ASSERT_EQ(0, ::stat(kServiceFile, &st));
  EXPECT_EQ(0644u, st.st_mode & 07777);
  EXPECT_EQ(1u, st.st_uid);
  EXPECT_EQ(1u, st.st_gid);
}

TEST(RegisterCertificate, ANewServiceReplacesTheFilesEntry) {
  ASSERT_TRUE(RegisterCertificate("AppPortal", "photo", "photo - a", ""));
  ASSERT_TRUE(RegisterCertificate("AppPortal", "photo_AltPort", "photo - 8443", "app:title"));
  EXPECT_EQ((Argvs{{"AppPortal", "photo"}, {"AppPortal", "photo_AltPort"}}),
            FakeCalls("tavocrtregister"));
  Json::Value document = ParseJson(ReadBytes(kServiceFile));
  ASSERT_EQ(1u, document["services"].size());
  const Json::Value& entry = document["services"][0];
  EXPECT_EQ((std::vector<std::string>{"display_name", "display_name_i18n", "service"}),
            Members(entry));
  EXPECT_EQ("photo - 8443", entry["display_name"].asString());
  EXPECT_EQ("app:title", entry["display_name_i18n"].asString());
  EXPECT_EQ("photo_AltPort", entry["service"].asString());
  EXPECT_EQ((std::vector<std::string>{"AppPortal.cfg"}), test::DirNames(kServiceDir));
}

// The tool's exit status decides; the service file is written before it runs,
// its directory made when missing.
TEST(RegisterCertificate, ToolDecidesAfterTheFileIsWritten) {
  const struct {
    const char* name;
    std::function<void()> setup;
    bool result;
  } cases[] = {
      {"failing tool", [] { SetFakeExit("tavocrtregister", 1); }, false},
      {"missing service directory", [] { test::RemoveTree(kServiceDir); }, true},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    test::ClearFakeCalls("tavocrtregister");
    SetFakeExit("tavocrtregister", 0);
    c.setup();
    EXPECT_EQ(c.result, RegisterCertificate("AppPortal", "photo", "photo - a", ""));
    EXPECT_EQ((Argvs{{"AppPortal", "photo"}}), FakeCalls("tavocrtregister"));
    EXPECT_EQ("photo", ParseJson(ReadBytes(kServiceFile))["services"][0]["service"].asString());
  }
}

TEST(RegisterCertificate, UnwritableFileStillRunsTheTool) {
  ASSERT_TRUE(RegisterCertificate("AppPortal", "photo", "photo - a", ""));
  const std::string before = ReadBytes(kServiceFile);
  {
    base::fault::Arm arm(1, base::fault::kPersistent, EIO, base::fault::Op::kRename);
    EXPECT_TRUE(RegisterCertificate("AppPortal", "video", "video - b", ""));
    EXPECT_TRUE(arm.fired());
  }
  EXPECT_EQ(before, ReadBytes(kServiceFile));
  EXPECT_EQ((std::vector<std::string>{"AppPortal.cfg"}), test::DirNames(kServiceDir));
  EXPECT_EQ((Argvs{{"AppPortal", "photo"}, {"AppPortal", "video"}}), FakeCalls("tavocrtregister"));
}

TEST(RegisterCertificate, ServiceDirectoryThatIsAFileStillRunsTheTool) {
  test::RemoveTree(kServiceDir);
  WriteBytes(kServiceDir, "not a directory");
  SetFakeExit("tavocrtregister", 4);
  EXPECT_FALSE(RegisterCertificate("AppPortal", "photo", "photo - a", ""));
  SetFakeExit("tavocrtregister", 0);
  EXPECT_TRUE(RegisterCertificate("AppPortal", "photo", "photo - a", ""));
  EXPECT_EQ((Argvs{{"AppPortal", "photo"}, {"AppPortal", "photo"}}), FakeCalls("tavocrtregister"));
  EXPECT_EQ("not a directory", ReadBytes(kServiceDir));
}

// Whatever the subscriber, the tool runs with it and its exit status decides;
// a path the document cannot be written to changes nothing of that.
TEST(RegisterCertificate, AnySubscriberIsPassedToTheTool) {
  for (const std::string subscriber : {"a/b", "", "AppPortal"}) {
    SCOPED_TRACE(subscriber);
    EXPECT_TRUE(RegisterCertificate(subscriber, "photo", "photo - a", ""));
  }
  EXPECT_EQ((Argvs{{"a/b", "photo"}, {"", "photo"}, {"AppPortal", "photo"}}),
            FakeCalls("tavocrtregister"));
  SetFakeExit("tavocrtregister", 3);
  EXPECT_FALSE(RegisterCertificate("a/b", "photo", "photo - a", ""));
  EXPECT_EQ("<missing>", ReadBytes("/usr/tavo/share/certificate.d/a/b.cfg"));
}

TEST(UnregisterCertificate, RunsTheToolOnlyForAnExistingDirectory) {
  ASSERT_TRUE(RegisterCertificate("AppPortal", "photo", "photo - a", ""));
  const std::string service_file = ReadBytes(kServiceFile);

  EXPECT_TRUE(UnregisterCertificate("AppPortal", "photo"));  // no directory
  EXPECT_EQ(Argvs{}, FakeCalls("tavocrtunregister"));

  WriteBytes(kCertificateDir, "a plain file");
  EXPECT_TRUE(UnregisterCertificate("AppPortal", "photo"));
  EXPECT_EQ(Argvs{}, FakeCalls("tavocrtunregister"));
  ASSERT_EQ(0, ::unlink(kCertificateDir));

  test::MakeDirs(kCertificateDir);
  EXPECT_TRUE(UnregisterCertificate("AppPortal", "photo"));
  EXPECT_EQ((Argvs{{"AppPortal", "photo"}}), FakeCalls("tavocrtunregister"));

  SetFakeExit("tavocrtunregister", 2);
  EXPECT_FALSE(UnregisterCertificate("AppPortal", "photo"));
  EXPECT_EQ((Argvs{{"AppPortal", "photo"}, {"AppPortal", "photo"}}),
            FakeCalls("tavocrtunregister"));

  EXPECT_EQ(service_file, ReadBytes(kServiceFile));  // left in place
}

TEST(AppPortalTLSNames, Builders) {
  EXPECT_EQ("photo", AppPortalTLSFQDNServiceName("photo"));
  EXPECT_EQ("photo_AltPort", AppPortalTLSAltPortServiceName("photo"));
  EXPECT_EQ("_AltPort", AppPortalTLSAltPortServiceName(""));
  EXPECT_EQ("photo - www.example.com", AppPortalTLSDesc("photo", std::string("www.example.com")));
  EXPECT_EQ("photo - ", AppPortalTLSDesc("photo", std::string()));
  for (const auto& [port, text] : std::vector<std::pair<int, std::string>>{
           {0, "0"}, {8443, "8443"}, {65535, "65535"}, {-1, "-1"}}) {
    EXPECT_EQ("photo - " + text, AppPortalTLSDesc("photo", port));
  }
}

}  // namespace
}  // namespace tavow3
