// The management interface's settings file rules, setters and the values it
// keeps outside the file (processor count, TLS store, recorded mode).
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <tavo/tavotls.h>
#include <tavow3/nginx_mode_recorder.h>
#include <tavow3/zam.h>

#include <functional>
#include <string>

#include "support/syslog_capture.h"
#include "support/test_engine.h"
#include "support/test_files.h"
#include "support/test_process.h"
#include "zam/zam_fixtures.h"

namespace tavow3 {
namespace {

using test::HasLogMatching;
using test::LogMessages;
using test::ParseJson;
using test::ReadBytes;
using test::WriteBytes;

// What a fresh object writes on 4 processors.
Json::Value DefaultDocument() {
  return ParseJson(R"({"version": 1, "port": 5000,
    "ssl": {"port": 5001, "spdy": false, "redirect": false,
            "certificate": "/usr/tavo/etc/ssl/ssl.chain.crt/server.crt",
            "key": "/usr/tavo/etc/ssl/ssl.key/server.key"},
    "directAccess": false, "fqdn": null, "https": {"compression": false, "hsts": false},
    "max_connections": null, "server_tag": "nginx", "trust_proxy": null})");
}

// `base` with the members of `changes` put over it, objects merged member by member.
Json::Value Merged(Json::Value base, const Json::Value& changes) {
  for (const std::string& name : changes.getMemberNames()) {
    if (changes[name].isObject() && base[name].isObject()) {
      base[name] = Merged(base[name], changes[name]);
    } else {
      base[name] = changes[name];
    }
  }
  return base;
}

Json::Value Written(ZAM& zam) {
  Json::Value value;
  EXPECT_TRUE(zam.TransVarToJson(value));
  return value;
}

TEST(ZAM, ReadingRules) {
  test::FakeProcessorCount(4);
  struct Case {
    const char* name;
    const char* stored;  // null: no stored file
    bool ok;
    const char* changes;  // members that differ from the defaults when written back
  };
  const Case cases[] = {
      {"no file", nullptr, false, "{}"},
      {"broken file", "{\"port\": ", false, "{}"},
      {"empty object", "{}", true, "{}"},
      {"not an object", "[1, 2]", true, "{}"},
      {"http port", R"({"port": 6000})", true, R"({"port": 6000})"},
      {"http port unchecked", R"({"port": 0})", true, R"({"port": 0})"},
      {"http port mistyped", R"({"port": "6000"})", true, "{}"},
      {"ssl members",
       R"({"ssl": {"port": 6001, "spdy": true, "redirect": true, "certificate": "/c.crt",
                   "key": "/k.key"}})",
       true,
       R"({"ssl": {"port": 6001, "spdy": true, "redirect": true, "certificate": "/c.crt",
                   "key": "/k.key"}})"},
      {"ssl port 0", R"({"ssl": {"port": 0}})", true, "{}"},
      {"ssl port 70000", R"({"ssl": {"port": 70000}})", true, "{}"},
      {"ssl port 65535", R"({"ssl": {"port": 65535}})", true, R"({"ssl": {"port": 65535}})"},
      {"empty paths keep the defaults", R"({"ssl": {"certificate": "", "key": ""}})", true, "{}"},
      {"ssl null", R"({"ssl": null, "port": 6000})", true, R"({"port": 6000})"},
      {"ssl mistyped members", R"({"ssl": {"spdy": 1, "redirect": "yes", "port": "6001"}})", true,
       "{}"},
      {"direct access", R"({"directAccess": true})", true, R"({"directAccess": true})"},
      {"direct access mistyped", R"({"directAccess": 1})", true, "{}"},
      {"fqdn", R"({"fqdn": "admin.example.com"})", true, R"({"fqdn": "admin.example.com"})"},
      {"fqdn mistyped", R"({"fqdn": 5})", true, "{}"},
      {"https flags", R"({"https": {"compression": true, "hsts": true, "http2": true}})", true,
       R"({"https": {"compression": true, "hsts": true}})"},
      {"max connections clamped up", R"({"max_connections": 10})", true,
       R"({"max_connections": 2048})"},
      {"max connections clamped down", R"({"max_connections": 200000})", true,
       R"({"max_connections": 131070})"},
      {"max connections in range", R"({"max_connections": 4000})", true,
       R"({"max_connections": 4000})"},
      {"max connections mistyped", R"({"max_connections": "4000"})", true, "{}"},
      {"server tag", R"({"server_tag": "Apache"})", true, R"({"server_tag": "Apache"})"},
      {"server tag null", R"({"server_tag": null})", true, R"({"server_tag": null})"},
      {"server tag empty", R"({"server_tag": ""})", true, R"({"server_tag": null})"},
      {"server tag mistyped", R"({"server_tag": 5})", true, R"({"server_tag": null})"},
      {"trusted proxies", R"({"trust_proxy": ["10.0.0.1", 5, "10.0.0.2"]})", true,
       R"({"trust_proxy": ["10.0.0.1", "10.0.0.2"]})"},
      {"trusted proxies mistyped", R"({"trust_proxy": "10.0.0.1"})", true, "{}"},
  };
  Engine engine = test::LoadedEngine();
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    test::RemoveTree(test::kStored);
    if (c.stored != nullptr) WriteBytes(test::kStored, c.stored);
    ZAM zam(engine);
    EXPECT_EQ(c.ok, zam.OK());
    EXPECT_FALSE(zam.Dirty());
    EXPECT_EQ(Merged(DefaultDocument(), ParseJson(c.changes)), Written(zam));
  }
}

TEST(ZAM, IllegalStoredDomainIsDropped) {
  WriteBytes(test::kStored, R"({"fqdn": "bad_name!", "port": 6000})");
  test::ClearLog();
  Engine engine = test::LoadedEngine();
  ZAM zam(engine);
  EXPECT_TRUE(zam.OK());
  EXPECT_EQ("", zam.getFQDN());
  EXPECT_TRUE(Written(zam)["fqdn"].isNull());
  EXPECT_EQ(6000, Written(zam)["port"].asInt());
  EXPECT_EQ(1u, test::LogsMatching(LogMessages(), "zam:\\d+ FQDN bad_name! is not legal").size());
}

// The factory file is read when the stored one cannot be, but the built-in
// defaults win all the same.
TEST(ZAM, FactoryFileIsReadButDefaultsWin) {
  struct Case {
    const char* name;
    const char* stored;
    const char* factory;
    bool default_line;  // "Failed to read ZAM nginx default config."
  };
  const Case cases[] = {
      {"both missing", nullptr, nullptr, true},
      {"factory present", nullptr, R"({"port": 7000, "ssl": {"port": 7001}})", false},
      {"stored broken, factory present", "{", R"({"port": 7000})", false},
      {"stored empty, factory broken", "", "{", true},
  };
  Engine engine = test::LoadedEngine();
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    test::RemoveTree(test::kStored);
    test::RemoveTree(test::kFactory);
    if (c.stored != nullptr) WriteBytes(test::kStored, c.stored);
    if (c.factory != nullptr) WriteBytes(test::kFactory, c.factory);
    test::ClearLog();
    ZAM zam(engine);
    EXPECT_FALSE(zam.OK());
    EXPECT_FALSE(zam.Get());
    EXPECT_EQ(5000, Written(zam)["port"].asInt());
    EXPECT_EQ(5001, Written(zam)["ssl"]["port"].asInt());
    const std::vector<std::string> logs = LogMessages();
    EXPECT_TRUE(
        HasLogMatching(logs, "zam:\\d+ Failed to read ZAM nginx config\\. Use default setting\\."));
    EXPECT_EQ(c.default_line,
              HasLogMatching(logs, "zam:\\d+ Failed to read ZAM nginx default config\\."));
  }
}

TEST(ZAM, SetJsonWritesTheStagingFile) {
  WriteBytes(test::kStored, R"({"port": 6000, "trust_proxy": ["10.1.1.1"]})");
  Engine engine = test::LoadedEngine();
  ZAM zam(engine);
  Json::Value value = Written(zam);
  ASSERT_TRUE(zam.SetJson(value));
  EXPECT_EQ(value, ParseJson(ReadBytes(test::kStaging)));
  struct stat st;
  ASSERT_EQ(0, ::stat(test::kStaging, &st));
  EXPECT_EQ(0644u, st.st_mode & 07777);
  EXPECT_EQ(1u, st.st_uid);
  EXPECT_EQ(1u, st.st_gid);
  EXPECT_EQ(R"({"port": 6000, "trust_proxy": ["10.1.1.1"]})", ReadBytes(test::kStored));
}

TEST(ZAM, SettersMarkDirtyOnlyWhereTheyShould) {
  test::FakeProcessorCount(4);
  struct Case {
    const char* name;
    std::function<bool(ZAM&)> set;
    bool dirty;
    const char* changes;  // written members that differ from the defaults afterwards
  };
  const Case cases[] = {
      {"spdy on", [](ZAM& z) { return z.SetEnableSPDY(); }, true, R"({"ssl": {"spdy": true}})"},
      {"spdy off unchanged", [](ZAM& z) { return z.SetDisableSPDY(); }, false, "{}"},
      {"spdy bool", [](ZAM& z) { return z.SetEnableSPDY(true); }, true,
       R"({"ssl": {"spdy": true}})"},
      {"hsts on", [](ZAM& z) { return z.setHSTS(true); }, true, R"({"https": {"hsts": true}})"},
      {"hsts off unchanged", [](ZAM& z) { return z.setHSTS(false); }, false, "{}"},
      {"redirect on", [](ZAM& z) { return z.SetEnableHttpsRedirect(); }, true,
       R"({"ssl": {"redirect": true}})"},
      {"redirect off unchanged", [](ZAM& z) { return z.SetDisableHttpsRedirect(); }, false, "{}"},
      {"direct access on", [](ZAM& z) { return z.SetEnableAccessDefaultPort(); }, true,
       R"({"directAccess": true})"},
      {"direct access off unchanged", [](ZAM& z) { return z.SetDisableAccessDefaultPort(); }, false,
       "{}"},
      {"compression on", [](ZAM& z) { return z.setHTTPCompression(true); }, true,
       R"({"https": {"compression": true}})"},
      {"compression off unchanged", [](ZAM& z) { return z.setHTTPCompression(false); }, false,
       "{}"},
      {"max connections", [](ZAM& z) { return z.SetMaxConnections(3000); }, false,
       R"({"max_connections": 3000})"},
      {"customised without a limit",
       [](ZAM& z) { return z.SetEnableCustomizedMaxConnections(true); }, false,
       R"({"max_connections": 0})"},
      {"server header off", [](ZAM& z) { return z.SetServerHeader(false, "ignored"); }, false,
       R"({"server_tag": null})"},
      {"server header named", [](ZAM& z) { return z.SetServerHeader(true, "tavo"); }, false,
       R"({"server_tag": "tavo"})"},
      {"trusted proxies",
       [](ZAM& z) {
         return z.SetTrustProxyList({"10.0.0.1", "fe80::1"});
       },
       false, R"({"trust_proxy": ["10.0.0.1", "fe80::1"]})"},
  };
  Engine engine = test::LoadedEngine();
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    ZAM zam(engine);
    ASSERT_FALSE(zam.Dirty());
    EXPECT_TRUE(c.set(zam));
    EXPECT_EQ(c.dirty, zam.Dirty());
    EXPECT_EQ(Merged(DefaultDocument(), ParseJson(c.changes)), Written(zam));
  }
}

// A server header that is off reads as none, whatever name came with it.
TEST(ZAM, ServerHeaderOffReadsAsNone) {
  Engine engine = test::LoadedEngine();
  ZAM zam(engine);
  EXPECT_TRUE(zam.GetEnableServerHeader());
  zam.SetServerHeader(false, "nginx");
  EXPECT_FALSE(zam.GetEnableServerHeader());
  EXPECT_EQ("", zam.GetServerHeader());
}

TEST(ZAM, ConnectionLimitsFollowTheProcessorCount) {
  struct Case {
    int processors;
    int lower;
    int upper;
    int total;       // MAX2WorkerConnections(total) ...
    int per_worker;  // ... == per_worker
  };
  const Case cases[] = {
      {4, 2048, 131070, 2048, 1024},
      {3, 1536, 98302, 1000, 666},  // divisions truncate
      {1, 512, 32767, 1000, 2000},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(testing::Message() << c.processors << " processors");
    test::FakeProcessorCount(c.processors);
    Engine engine = test::LoadedEngine();
    ZAM zam(engine);
    EXPECT_EQ(c.lower, zam.GetLowerLimitMaxConnections());
    EXPECT_EQ(c.upper, zam.GetUpperLimitMaxConnections());
    EXPECT_EQ(c.per_worker, ZAM::MAX2WorkerConnections(c.total));
    EXPECT_EQ(c.lower, ZAM::Worker2MaxConnections(1024));
    EXPECT_FALSE(zam.IsCustomizedMaxConnections());
    EXPECT_EQ(c.lower, zam.GetMaxConnections());
    EXPECT_EQ(c.lower, zam.CorrectMaxConnections(c.lower - 1));
    EXPECT_EQ(c.upper, zam.CorrectMaxConnections(c.upper + 1));
    EXPECT_EQ(c.lower + 1, zam.CorrectMaxConnections(c.lower + 1));

    EXPECT_FALSE(zam.SetMaxConnections(c.lower - 1));
    EXPECT_FALSE(zam.SetMaxConnections(c.upper + 1));
    EXPECT_FALSE(zam.IsCustomizedMaxConnections());
    EXPECT_EQ(c.lower, zam.GetMaxConnections());
    EXPECT_TRUE(zam.SetMaxConnections(c.upper));
    EXPECT_EQ(c.upper, zam.GetMaxConnections());
    EXPECT_TRUE(zam.SetMaxConnections(c.lower));
    EXPECT_TRUE(zam.IsCustomizedMaxConnections());
    EXPECT_EQ(c.lower, zam.GetMaxConnections());
    EXPECT_TRUE(zam.SetEnableCustomizedMaxConnections(false));
    EXPECT_EQ(c.lower, zam.GetMaxConnections());
    EXPECT_TRUE(Written(zam)["max_connections"].isNull());
    test::MustRun({"/bin/umount", "/sys/devices/system/cpu/online"});
  }
}

constexpr char kTLSStore[] = "/usr/tavo/etc/tls/services.json";

TEST(ZAM, TLSProfileMapsToTheStoreLevel) {
  Engine engine = test::LoadedEngine();
  {
    SCOPED_TRACE("a new store holds zam at level 2");
    ZAM zam(engine);
    EXPECT_EQ(1, zam.getTLSProfile());
  }
  struct Case {
    int profile;
    int level;
  };
  const Case cases[] = {{0, 3}, {1, 2}, {2, 1}};
  for (const Case& c : cases) {
    SCOPED_TRACE(testing::Message() << "profile " << c.profile);
    ASSERT_EQ(0, tavotls::DataStoreProvider::set_service_level("zam", c.level));
    ZAM reader(engine);
    EXPECT_EQ(c.profile, reader.getTLSProfile());

    // Written from another profile, the store gets the mapped level.
    ASSERT_EQ(0, tavotls::DataStoreProvider::set_service_level("zam", c.level == 1 ? 3 : 1));
    ZAM writer(engine);
    EXPECT_TRUE(writer.setTLSProfile(c.profile));
    EXPECT_TRUE(writer.Dirty());
    EXPECT_EQ(c.level, tavotls::DataStoreProvider::get_service_level("zam"));
  }
  {
    SCOPED_TRACE("same profile writes nothing");
    const ino_t before = test::InodeOf(kTLSStore);
    ASSERT_NE(0u, before);
    ZAM zam(engine);
    EXPECT_TRUE(zam.setTLSProfile(zam.getTLSProfile()));
    EXPECT_FALSE(zam.Dirty());
    EXPECT_EQ(before, test::InodeOf(kTLSStore));
  }
  for (int profile : {-1, 3}) {
    SCOPED_TRACE(testing::Message() << "refused profile " << profile);
    const std::string before = ReadBytes(kTLSStore);
    ZAM zam(engine);
    EXPECT_FALSE(zam.setTLSProfile(profile));
    EXPECT_FALSE(zam.Dirty());
    EXPECT_EQ(before, ReadBytes(kTLSStore));
  }
}

TEST(ZAM, UnknownStoreLevelReadsAsProfileOne) {
  Engine engine = test::LoadedEngine();
  for (const char* store :
       {R"({"services": {"zam": {"display-name": "ZAM", "display-name-i18n": "", "level": 0}}})",
        R"({"services": {"zam": {"display-name": "ZAM", "display-name-i18n": "", "level": 4}}})",
        R"({"services": {}})"}) {
    SCOPED_TRACE(store);
    WriteBytes(kTLSStore, store);
    test::ClearLog();
    ZAM zam(engine);
    EXPECT_EQ(1, zam.getTLSProfile());
    EXPECT_TRUE(HasLogMatching(
        LogMessages(),
        "zam:\\d+ tavotls2tlsprofile get invalid value -?\\d+, returning failsafe value\\."));
  }
}

TEST(ZAM, PortsReadAsDefaultsWhileTheDefaultConfigurationRuns) {
  WriteBytes(test::kStored, R"({"port": 6000, "ssl": {"port": 6001}})");
  Engine engine = test::LoadedEngine();
  ZAM zam(engine);
  EXPECT_EQ(5000, zam.GetHttpDefaultPort());
  EXPECT_EQ(5001, zam.GetHttpsDefaultPort());
  struct Case {
    const char* name;
    NGINXCONF_TYPE mode;  // NGINXCONF_NONE: nothing recorded
    unsigned short http;
    unsigned short https;
  };
  const Case cases[] = {
      {"no mode", NGINXCONF_NONE, 6000, 6001},
      {"normal", NGINXCONF_NORMAL, 6000, 6001},
      {"default", NGINXCONF_DEFAULT, 5000, 5001},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    if (c.mode != NGINXCONF_NONE) {
      ASSERT_TRUE(NginxModeRecorder::RecordMode(c.mode));
    }
    EXPECT_EQ(c.http, zam.GetHttpPort());
    EXPECT_EQ(c.https, zam.GetHttpsPort());
  }
}

}  // namespace
}  // namespace tavow3
