#include "tavo/tavotls.h"

#include <gtest/gtest.h>
#include <json/value.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "support/test_files.h"
#include "support/test_mounts.h"

namespace {

using tavow3::test::DirNames;
using tavow3::test::FreshDir;
using tavow3::test::ReadJson;
using tavow3::test::ReadBytes;
using tavow3::test::WriteBytes;
using tavotls::APIProvider;
using tavotls::DataStoreProvider;

constexpr char kStore[] = "/usr/tavo/etc/tls/services.json";
constexpr char kStoreDir[] = "/usr/tavo/etc/tls";

Json::Value Entry(const std::string& name, const std::string& i18n, int level) {
  Json::Value entry(Json::objectValue);
  entry["display-name"] = name;
  entry["display-name-i18n"] = i18n;
  entry["level"] = level;
  return entry;
}

// A framework document with one entry per (service, display name) pair.
Json::Value Document(const std::vector<std::pair<std::string, std::string>>& services) {
  Json::Value document(Json::objectValue);
  document["system-service"] = false;
  document["services"] = Json::Value(Json::arrayValue);
  for (const auto& [service, display] : services) {
    Json::Value item(Json::objectValue);
    item["service"] = service;
    item["display-name"] = display;
    document["services"].append(item);
  }
  return document;
}

class TavoTls : public testing::Test {
 protected:
  void SetUp() override { std::filesystem::remove_all(kStoreDir); }
};

TEST_F(TavoTls, FreshStoreHoldsZamAtLevelTwoWithoutWriting) {
  Json::Value expected(Json::objectValue);
  expected["zam"] = Entry("ZAM", "", 2);
  EXPECT_EQ(expected, DataStoreProvider::list_services());
  EXPECT_EQ(2, DataStoreProvider::get_service_level("zam"));
  EXPECT_EQ(-1, DataStoreProvider::get_service_level("AppPortal_x"));
  EXPECT_FALSE(std::filesystem::exists(kStoreDir));
}

TEST_F(TavoTls, JoinSetLevelAndLeaveReachTheStoredFile) {
  Json::Value document = Document({{"AppPortal_a", "a - portal"}, {"ReverseProxy_b", ""}});
  document["services"][0]["display-name-i18n"] = "app:desc";
  ASSERT_EQ(0, APIProvider::join_framework(document));
  struct stat st;
  ASSERT_EQ(0, ::stat(kStore, &st));
  EXPECT_EQ(0644u, st.st_mode & 07777);
  ASSERT_EQ(0, DataStoreProvider::set_service_level("AppPortal_a", 3));
  ASSERT_EQ(0, DataStoreProvider::set_service_level("zam", 1));
  ASSERT_EQ(0, DataStoreProvider::set_service_level("NewOne", 1));
  // A second join updates the names and keeps the chosen level.
  ASSERT_EQ(0, APIProvider::join_framework(Document({{"AppPortal_a", "renamed"}})));
  ASSERT_EQ(0, APIProvider::leave_framework(Document({{"ReverseProxy_b", ""}})));
  ASSERT_EQ(0, APIProvider::leave_framework(Document({{"never_joined", ""}})));
  ASSERT_EQ(0, APIProvider::join_framework(Document({})));

  Json::Value services(Json::objectValue);
  services["zam"] = Entry("ZAM", "", 1);
  services["AppPortal_a"] = Entry("renamed", "", 3);
  services["NewOne"] = Entry("NewOne", "", 1);
  Json::Value stored(Json::objectValue);
  stored["services"] = services;
  EXPECT_EQ(stored, ReadJson(kStore));
  EXPECT_EQ(services, DataStoreProvider::list_services());
  EXPECT_EQ(3, DataStoreProvider::get_service_level("AppPortal_a"));
  EXPECT_EQ(-1, DataStoreProvider::get_service_level("ReverseProxy_b"));
  EXPECT_EQ(std::vector<std::string>{"services.json"}, DirNames(kStoreDir));
}

TEST_F(TavoTls, RefusesMalformedDocumentsAndLevels) {
  Json::Value no_name = Document({{"x", "y"}});
  no_name["services"][0].removeMember("display-name");
  Json::Value bad_i18n = Document({{"x", "y"}});
  bad_i18n["services"][0]["display-name-i18n"] = 5;
  Json::Value bad_service = Document({{"x", "y"}});
  bad_service["services"][0]["service"] = 7;
  Json::Value one_bad = Document({{"good", "g"}, {"", "empty name"}});
  Json::Value not_array(Json::objectValue);
  not_array["services"] = "x";
  Json::Value item_not_object(Json::objectValue);
  item_not_object["services"].append(1);
  const Json::Value joins[] = {Json::Value(), Json::Value("doc"), Json::Value(Json::objectValue),
                               not_array,     item_not_object,   no_name,
                               bad_i18n,      bad_service,       one_bad};
  for (const Json::Value& document : joins) {
    SCOPED_TRACE(document.toStyledString());
    EXPECT_EQ(-1, APIProvider::join_framework(document));
  }
  const Json::Value leaves[] = {Json::Value(), not_array, item_not_object, bad_service, one_bad};
  for (const Json::Value& document : leaves) {
    SCOPED_TRACE(document.toStyledString());
    EXPECT_EQ(-1, APIProvider::leave_framework(document));
  }
  for (int level : {0, 4, -1}) EXPECT_EQ(-1, DataStoreProvider::set_service_level("zam", level));
  EXPECT_EQ(-1, DataStoreProvider::set_service_level("", 2));
  EXPECT_FALSE(std::filesystem::exists(kStore));  // nothing was written
}

TEST_F(TavoTls, InvalidStoreIsNeverOverwritten) {
  const std::string stores[] = {"not json", "[]", "{\"services\": []}",
                                "{\"services\": {\"zam\": {\"display-name\": \"ZAM\", "
                                "\"display-name-i18n\": \"\", \"level\": 7}}}",
                                "{\"services\": {\"zam\": {\"level\": 2}}}"};
  for (const std::string& text : stores) {
    SCOPED_TRACE(text);
    WriteBytes(kStore, text);
    EXPECT_EQ(Json::Value(Json::objectValue), DataStoreProvider::list_services());
    EXPECT_EQ(-1, DataStoreProvider::get_service_level("zam"));
    EXPECT_EQ(-1, APIProvider::join_framework(Document({{"a", "b"}})));
    EXPECT_EQ(-1, APIProvider::leave_framework(Document({{"zam", ""}})));
    EXPECT_EQ(-1, DataStoreProvider::set_service_level("zam", 1));
    EXPECT_EQ(text, ReadBytes(kStore));
  }
}

TEST_F(TavoTls, StoreFailureKeepsTheOldStore) {
  ASSERT_EQ(0, APIProvider::join_framework(Document({{"a", "b"}})));
  const std::string before = ReadBytes(kStore);
  ASSERT_TRUE(tavow3::test::BindReadOnly(kStoreDir));
  EXPECT_EQ(-1, APIProvider::join_framework(Document({{"c", "d"}})));
  EXPECT_EQ(-1, DataStoreProvider::set_service_level("a", 3));
  EXPECT_EQ(before, ReadBytes(kStore));
  EXPECT_EQ(2, DataStoreProvider::get_service_level("a"));
  EXPECT_EQ(std::vector<std::string>{"services.json"}, DirNames(kStoreDir));
}

TEST_F(TavoTls, ConcurrentJoinsLoseNothing) {
  constexpr int kProcesses = 4;
  constexpr int kJoinsEach = 20;
  int gate[2];
  ASSERT_EQ(0, ::pipe(gate));
  std::vector<pid_t> children;
  for (int p = 0; p < kProcesses; ++p) {
    pid_t pid = ::fork();
    ASSERT_LE(0, pid);
    if (pid == 0) {
      ::close(gate[1]);
      char byte;
      (void)::read(gate[0], &byte, 1);  // released together when the pipe closes
      int failures = 0;
      for (int i = 0; i < kJoinsEach; ++i) {
        std::string name = "svc_" + std::to_string(p) + "_" + std::to_string(i);
        if (APIProvider::join_framework(Document({{name, name}})) != 0) ++failures;
        if (i % 5 == 0 && DataStoreProvider::set_service_level(name, 3) != 0) ++failures;
      }
      ::_exit(failures == 0 ? 0 : 1);
    }
    children.push_back(pid);
  }
  ::close(gate[0]);
  ::close(gate[1]);
  for (pid_t pid : children) {
    int status = 0;
    ASSERT_EQ(pid, ::waitpid(pid, &status, 0));
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
  }
  Json::Value services = DataStoreProvider::list_services();
  EXPECT_EQ(static_cast<unsigned>(kProcesses * kJoinsEach + 1), services.size());
  for (int p = 0; p < kProcesses; ++p) {
    for (int i = 0; i < kJoinsEach; ++i) {
      std::string name = "svc_" + std::to_string(p) + "_" + std::to_string(i);
      SCOPED_TRACE(name);
      EXPECT_EQ(Entry(name, "", i % 5 == 0 ? 3 : 2), services[name]);
    }
  }
  EXPECT_EQ(std::vector<std::string>{"services.json"}, DirNames(kStoreDir));
}

}  // namespace
