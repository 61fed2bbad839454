// W3SyncCrtInfo: certificate documents, registration runs and the TLS store.
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <set>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <tavo/tavotls.h>
#include <tavow3/engine_v2.h>

#include "engine/crt_sync.h"
#include "engine/engine_private.h"
#include "support/fake_tools.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"
#include "support/test_mounts.h"

namespace tavow3::test {
namespace {

using Calls = std::vector<std::vector<std::string>>;

constexpr char kCertificateDir[] = "/usr/tavo/share/certificate.d";

// An EngineV2 holding only the given records (no registration callbacks run).
EngineV2 EngineWith(const std::vector<CrtResource>& resources,
                    const std::vector<std::string>& packages = {}) {
  EngineV2 engine;
  engine.engine().impl().load_state = 2;
  for (const CrtResource& resource : resources) EXPECT_TRUE(RegisterCrtResource(engine, resource));
  for (const std::string& package : packages) RegisterPackageSubscriber(engine, package);
  return engine;
}

std::string Cfg(const std::string& subscriber) {
  return std::string(kCertificateDir) + "/" + subscriber + ".cfg";
}

// The document's services sorted by name; the order carries no meaning.
Json::Value SortedServices(Json::Value document) {
  std::vector<Json::Value> services(document["services"].begin(), document["services"].end());
  std::sort(services.begin(), services.end(), [](const Json::Value& a, const Json::Value& b) {
    return a["service"].asString() < b["service"].asString();
  });
  document["services"] = Json::Value(Json::arrayValue);
  for (const Json::Value& service : services) document["services"].append(service);
  return document;
}

std::set<std::string> TlsServices() {
  const std::vector<std::string> names = tavotls::DataStoreProvider::list_services().getMemberNames();
  return std::set<std::string>(names.begin(), names.end());
}

TEST(W3SyncCrtInfo, NoResourcesStillJoinsAnEmptyList) {
  const std::vector<std::string> before = DirNames(kCertificateDir);
  const std::set<std::string> tls_before = TlsServices();
  EngineV2 engine = EngineWith({});
  EXPECT_TRUE(engine.W3SyncCrtInfo());
  EXPECT_EQ(before, DirNames(kCertificateDir));
  EXPECT_TRUE(FakeCalls("tavocrtregister").empty());
  EXPECT_EQ(tls_before, TlsServices());
}

TEST(W3SyncCrtInfo, RegistersEverySubscriberThenJoinsEveryService) {
  EngineV2 engine = EngineWith({{"system", "zam", "Management", "zam:title"},
                                {"system", "www", "Web service", ""},
                                {"portal", "app1", "App \"One\"", "portal:app1"},
                                {"pkgweb", "site", "Site", ""}},
                               {"pkgweb"});
  EXPECT_TRUE(engine.W3SyncCrtInfo());

  EXPECT_EQ((Calls{{"pkgweb"}, {"portal"}, {"system"}}), FakeCalls("tavocrtregister"));
  EXPECT_EQ(ParseJson(R"({"owner":"root","isPkg":false,"services":[
                {"service":"www","display_name":"Web service","display_name_i18n":""},
                {"service":"zam","display_name":"Management","display_name_i18n":"zam:title"}]})"),
            SortedServices(ReadJson(Cfg("system"))));
  EXPECT_EQ(ParseJson(R"({"owner":"root","isPkg":false,"services":[
                {"service":"app1","display_name":"App \"One\"","display_name_i18n":"portal:app1"}]})"),
            ReadJson(Cfg("portal")));
  EXPECT_EQ(ParseJson(R"({"owner":"root","isPkg":true,"services":[
                {"service":"site","display_name":"Site","display_name_i18n":""}]})"),
            ReadJson(Cfg("pkgweb")));

  const Json::Value tls = tavotls::DataStoreProvider::list_services();
  EXPECT_EQ("Management", tls["system_zam"]["display-name"].asString());
  EXPECT_EQ("zam:title", tls["system_zam"]["display-name-i18n"].asString());
  EXPECT_EQ("App \"One\"", tls["portal_app1"]["display-name"].asString());
  for (const char* service : {"system_www", "pkgweb_site"}) {
    SCOPED_TRACE(service);
    ASSERT_TRUE(tls.isMember(service));
    EXPECT_EQ("", tls[service]["display-name-i18n"].asString());
  }
}

TEST(W3SyncCrtInfo, TlsDocumentNamesEveryService) {
  EngineV2 engine = EngineWith({{"system", "zam", "Management", "zam:title"},
                                {"system", "www", "Web service", ""},
                                {"portal", "app1", "App", "portal:app1"}},
                               {"portal"});
  EXPECT_EQ(ParseJson(R"({"system-service":false,"services":[
                {"service":"portal_app1","display-name":"App","display-name-i18n":"portal:app1"},
                {"service":"system_www","display-name":"Web service"},
                {"service":"system_zam","display-name":"Management","display-name-i18n":"zam:title"}]})"),
            SortedServices(TlsServiceDocument(engine.security())));
  EXPECT_EQ(ParseJson(R"({"system-service":false,"services":[]})"),
            TlsServiceDocument(EngineWith({}).security()));
}

// Replaces the registration tool by one that appends its subscriber to
// /run/crt-runs and fails for the subscriber `failing` only.
void InstallToolFailingFor(const std::string& failing) {
  const std::string tool = "/usr/tavo/bin/tavocrtregister";
  ASSERT_EQ(0, ::unlink(tool.c_str()));
  WriteBytes(tool, "#!/bin/sh\necho \"$1\" >> /run/crt-runs\ntest \"$1\" != \"" + failing + "\"\n",
             0755);
}

TEST(W3SyncCrtInfo, OneFailedRegistrationSkipsTheFramework) {
  const std::set<std::string> tls_before = TlsServices();
  InstallToolFailingFor("beta");
  ClearLog();
  EngineV2 engine = EngineWith({{"alpha", "a", "A", ""}, {"beta", "b", "B", ""},
                                {"gamma", "c", "C", ""}});
  EXPECT_FALSE(engine.W3SyncCrtInfo());
  EXPECT_EQ("alpha\nbeta\ngamma\n", ReadBytes("/run/crt-runs"));
  EXPECT_EQ(std::vector<std::string>{"engine_v2:92 Faid to register certificate for subscriber beta"},
            LogMessages(LOG_ERR));
  EXPECT_EQ(tls_before, TlsServices());
}

TEST(W3SyncCrtInfo, EveryFailedRegistrationIsLogged) {
  const std::set<std::string> tls_before = TlsServices();
  SetFakeExit("tavocrtregister", 1);
  ClearLog();
  EngineV2 failing = EngineWith({{"alpha", "a", "A", ""}, {"gamma", "c", "C", ""}});
  EXPECT_FALSE(failing.W3SyncCrtInfo());
  EXPECT_EQ((Calls{{"alpha"}, {"gamma"}}), FakeCalls("tavocrtregister"));
  EXPECT_EQ((std::vector<std::string>{"engine_v2:92 Faid to register certificate for subscriber alpha",
                                      "engine_v2:92 Faid to register certificate for subscriber gamma"}),
            LogMessages(LOG_ERR));
  EXPECT_EQ(tls_before, TlsServices());
}

// The tool's exit status alone decides: a document that cannot be written is
// neither logged nor a reason to skip the tool, whatever the subscriber's name.
TEST(W3SyncCrtInfo, UnwritableDocumentStillRunsTheTool) {
  const struct {
    const char* name;
    std::vector<CrtResource> resources;
    bool read_only;
    Calls calls;
  } cases[] = {
      {"read-only directory", {{"alpha", "a", "A", ""}}, true, {{"alpha"}}},
      {"name that is no file name", {{"bad/name", "b", "B", ""}}, false, {{"bad/name"}}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    ClearFakeCalls("tavocrtregister");
    if (c.read_only) {
      ASSERT_TRUE(BindReadOnly(kCertificateDir));
    }
    const std::vector<std::string> before = DirNames(kCertificateDir);
    ClearLog();
    EngineV2 engine = EngineWith(c.resources);
    EXPECT_TRUE(engine.W3SyncCrtInfo());
    EXPECT_EQ(c.calls, FakeCalls("tavocrtregister"));
    EXPECT_EQ(std::vector<std::string>{}, LogMessages(LOG_ERR));
    EXPECT_EQ(before, DirNames(kCertificateDir));
    const Json::Value tls = tavotls::DataStoreProvider::list_services();
    for (const CrtResource& resource : c.resources) {
      EXPECT_TRUE(tls.isMember(resource.subscriber + "_" + resource.service)) << resource.subscriber;
    }
  }
}

TEST(W3SyncCrtInfo, FrameworkFailureDecides) {
  ASSERT_TRUE(BindReadOnly("/usr/tavo/etc/tls"));
  EngineV2 engine = EngineWith({{"alpha", "a", "A", ""}});
  EXPECT_FALSE(engine.W3SyncCrtInfo());
  EXPECT_EQ((Calls{{"alpha"}}), FakeCalls("tavocrtregister"));
}

}  // namespace
}  // namespace tavow3::test
