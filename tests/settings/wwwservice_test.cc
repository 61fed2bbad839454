// The general web service's settings file rules, registration and staged save.
#include <gtest/gtest.h>

#include <functional>

#include <tavow3/engine.h>
#include <tavow3/wwwservice.h>

#include "engine/engine_private.h"
#include "support/syslog_capture.h"
#include "support/test_files.h"

namespace tavow3 {
namespace {

using test::HasLogMatching;
using test::LogMessages;
using test::ParseJson;
using test::PathExists;
using test::ReadBytes;
using test::RemoveTree;
using test::WriteBytes;

constexpr char kStored[] = "/usr/tavo/etc/www/WWWService.json";
constexpr char kStaging[] = "/var/tmp/nginx/WWWService.json";
constexpr char kScratch[] = "/var/tmp/nginx/WWWService.tmp";
constexpr char kTempConf[] = "/var/tmp/nginx/nginx.conf";
constexpr char kDefaultCert[] = "/usr/tavo/etc/ssl/ssl.chain.crt/server.crt";
constexpr char kDefaultKey[] = "/usr/tavo/etc/ssl/ssl.key/server.key";

TEST(WWWService, ReadingRules) {
  struct Case {
    const char* name;
    const char* content;  // null: no file
    bool ok;
    int http;
    int https;
    const char* cert;
    bool spdy;
    bool hsts;
  };
  const Case cases[] = {
      {"no file", nullptr, true, 0, 0, kDefaultCert, false, false},
      {"empty file", "", true, 0, 0, kDefaultCert, false, false},
      {"blank file", "  \n", true, 0, 0, kDefaultCert, false, false},
      {"broken file", "{\"additionalPort\":", false, 0, 0, kDefaultCert, false, false},
      {"https without ssl is ignored", "{\"additionalPort\": {\"http\": 8080, \"https\": 8443}}", true,
       8080, 0, kDefaultCert, false, false},
      {"https with ssl", "{\"additionalPort\": {\"https\": 8443}, \"ssl\": {\"spdy\": true}}", true, 0,
       8443, kDefaultCert, true, false},
      {"empty certificate keeps default",
       "{\"ssl\": {\"certificate\": \"\", \"hsts\": true, \"spdy\": \"yes\"}}", true, 0, 0, kDefaultCert,
       false, true},
      {"certificate taken", "{\"ssl\": {\"certificate\": \"/c.crt\"}}", true, 0, 0, "/c.crt", false, false},
      {"mistyped ports", "{\"additionalPort\": {\"http\": \"80\", \"https\": 1.5}, \"ssl\": {}}", true, 0,
       0, kDefaultCert, false, false},
      {"null objects", "{\"additionalPort\": null, \"ssl\": null}", true, 0, 0, kDefaultCert, false, false},
      {"not an object", "[8081]", true, 0, 0, kDefaultCert, false, false},
      {"a number", "8081", true, 0, 0, kDefaultCert, false, false},
  };
  Engine engine;
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    RemoveTree(kStored);
    if (c.content != nullptr) WriteBytes(kStored, c.content);
    test::ClearLog();
    WWWService www(engine);
    EXPECT_EQ(c.ok, www.OK());
    EXPECT_EQ(c.http, www.GetHttpAddPort());
    EXPECT_EQ(c.http != 0, www.GetEnableHttpAddPort());
    EXPECT_EQ(c.https, www.GetHttpsAddPort());
    EXPECT_EQ(c.https != 0, www.GetEnableHttpsAddPort());
    EXPECT_EQ(c.cert, www.GetCERT());
    EXPECT_EQ(kDefaultKey, www.GetKEY());
    EXPECT_EQ(c.spdy, www.GetEnableSPDY());
    EXPECT_EQ(c.hsts, www.GetEnableHSTS());
    EXPECT_EQ(!c.ok, HasLogMatching(LogMessages(), "wwwservice:\\d+ Failed to read pagora config"));
  }
}

TEST(WWWService, WritingRules) {
  Engine engine;
  struct Case {
    const char* stored;
    const char* expected;
  };
  const Case cases[] = {
      {nullptr,
       "{\"version\": 1, \"additionalPort\": null, \"ssl\": {\"certificate\": "
       "\"/usr/tavo/etc/ssl/ssl.chain.crt/server.crt\", \"key\": \"/usr/tavo/etc/ssl/ssl.key/server.key\", "
       "\"spdy\": false, \"hsts\": false}}"},
      {"{\"additionalPort\": {\"http\": 81, \"https\": 444}, \"ssl\": {\"key\": \"/k\", \"hsts\": true}}",
       "{\"version\": 1, \"additionalPort\": {\"http\": 81, \"https\": 444}, \"ssl\": {\"certificate\": "
       "\"/usr/tavo/etc/ssl/ssl.chain.crt/server.crt\", \"key\": \"/k\", \"spdy\": false, \"hsts\": true}}"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.stored ? c.stored : "no file");
    RemoveTree(kStored);
    if (c.stored != nullptr) WriteBytes(kStored, c.stored);
    WWWService www(engine);
    Json::Value value;
    ASSERT_TRUE(www.TransVarToJson(value));
    EXPECT_EQ(ParseJson(c.expected), value);
    ASSERT_TRUE(www.SetJson(value));
    EXPECT_EQ(ParseJson(c.expected), ParseJson(ReadBytes(kStaging)));
  }
}

// The engine's load cycle registers what the stored file holds.
TEST(WWWService, RegistersTheStoredAdditionalPorts) {
  WriteBytes(kStored, "{\"additionalPort\": {\"http\": 8081, \"https\": 8444}, \"ssl\": {}}");
  Engine engine;
  engine.load();
  const auto& resources = engine.impl().fqdn_resources;
  ASSERT_EQ(1u, resources.count({"", 8081}));
  ASSERT_EQ(1u, resources.count({"", 8444}));
  const FQDNPortSchemaResource& http = resources.at({"", 8081});
  const FQDNPortSchemaResource& https = resources.at({"", 8444});
  EXPECT_EQ(FQDNPortSchemaResource::HTTP, http.schema);
  EXPECT_EQ("http_extra", http.section);
  EXPECT_EQ("firewall:firewall_service_opt_http_extra", http.title_key);
  EXPECT_EQ(FQDNPortSchemaResource::HTTPS, https.schema);
  EXPECT_EQ("https_extra", https.section);
  EXPECT_EQ("firewall:firewall_service_opt_https_extra", https.title_key);
  for (const FQDNPortSchemaResource* r : {&http, &https}) {
    EXPECT_EQ("", r->fqdn);
    EXPECT_EQ("Pagora", r->desc);
    EXPECT_EQ("firewall:firewall_service_desc_http", r->desc_key);
    EXPECT_EQ("tavow3", r->owner);
    EXPECT_EQ(0, r->protocol);
  }

  RemoveTree(kStored);
  Engine empty;
  empty.load();
  for (const auto& entry : empty.impl().fqdn_resources) {
    EXPECT_NE("http_extra", entry.second.section) << entry.second.port;
    EXPECT_NE("https_extra", entry.second.section) << entry.second.port;
  }
}

// A failed save leaves the stored file as it was, with no staging, scratch or
// temporary configuration: when the firewall file cannot be rendered after the
// configuration was generated and tested, and when nginx rejects the
// configuration. In this order: the second breakage stops the save earlier.
TEST(WWWService, FailedSaveLeavesTheStoredFileAndNoWorkFiles) {
  struct Case {
    const char* name;
    std::function<void()> breakage;
    const char* log;  // a line expected in the log, or null
  };
  const Case cases[] = {
      {"firewall file cannot be rendered",
       [] { WriteBytes("/usr/tavo/share/nginx/Firewall.mustache", "{{#sections}}unclosed\n"); },
       "engine:361 Fail to generate sc file through mustache"},
      {"nginx rejects the configuration",
       [] {
         WriteBytes("/usr/tavo/etc/rc.sysv/nginx-conf-generator.sh",
                    "#!/bin/sh\necho 'this is not nginx' > /var/tmp/nginx/nginx.conf\n"
                    "touch /var/tmp/nginx/WWWService.tmp\n",
                    0755);
       },
       nullptr},
  };
  const std::string stored = "{\"additionalPort\": {\"http\": 8081}}";
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    WriteBytes(kStored, stored);
    c.breakage();
    Engine engine;
    WWWService www(engine);
    test::ClearLog();
    EXPECT_FALSE(www.Save());
    if (c.log != nullptr) {
      EXPECT_TRUE(HasLogMatching(LogMessages(), c.log));
    }
    EXPECT_EQ(stored, ReadBytes(kStored));
    EXPECT_FALSE(PathExists(kStaging));
    EXPECT_FALSE(PathExists(kScratch));
    EXPECT_FALSE(PathExists(kTempConf));
  }
}

}  // namespace
}  // namespace tavow3
