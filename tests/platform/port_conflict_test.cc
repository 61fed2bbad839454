#include <gtest/gtest.h>

#include <cerrno>
#include <string>
#include <vector>

#include "tavo/service_conf.h"

namespace {

struct Outcome {
  int result;
  std::vector<int> ports;
  int error;
};

// Calls TLIBIsPortConflict on writable copies and checks they stay unchanged.
Outcome Check(const std::string& claimed, const std::string& candidates, const char* proto = "tcp",
              int max_conflicts = 12) {
  std::vector<char> claimed_buffer(claimed.begin(), claimed.end());
  std::vector<char> candidate_buffer(candidates.begin(), candidates.end());
  claimed_buffer.push_back('\0');
  candidate_buffer.push_back('\0');
  TAVO_SERVICE_PORTS sentinel{};
  TAVO_SERVICE_PORTS* list = &sentinel;
  errno = 0;
  Outcome outcome{TLIBIsPortConflict(claimed_buffer.data(), candidate_buffer.data(), proto,
                                     max_conflicts, &list),
                  {}, errno};
  EXPECT_STREQ(claimed.c_str(), claimed_buffer.data());
  EXPECT_STREQ(candidates.c_str(), candidate_buffer.data());
  if (outcome.result == -1) {
    EXPECT_EQ(&sentinel, list);  // nothing stored
    return outcome;
  }
  if (outcome.result == 0) {
    EXPECT_EQ(nullptr, list);
  }
  for (TAVO_SERVICE_PORTS* entry = list; entry != nullptr; entry = entry->next) {
    outcome.ports.push_back(entry->port);
  }
  TAVOServiceConfPortsFree(list);
  return outcome;
}

TEST(TLIBIsPortConflict, ReportsCandidatePortsInClaimedLists) {
  struct Case {
    const char* claimed;
    const char* candidates;
    int result;
    std::vector<int> ports;
  } cases[] = {
      {"", "", 0, {}},
      {"", "80,", 0, {}},
      {"80,443,", "", 0, {}},
      {",,", " , ", 0, {}},
      {"80,443,", "443,", 1, {443}},
      {"80,443,", "444,81,", 0, {}},
      {"5000,5001,", "5001,5000,", 1, {5000, 5001}},
      {" 80 , 443 ,", "\t443\t,80", 1, {80, 443}},
      {"80,", "80,80,80,", 1, {80}},
      {"1,", "1,", 1, {1}},
      {"65535,", "65535,", 1, {65535}},
      {"1:65535,", "1,65535,", 1, {1, 65535}},
      {"8000:8010,", "7990:8000,", 1, {8000}},
      {"8000:8010,", "8010:8020,", 1, {8010}},
      {"8000:8010,", "7999,8011,", 0, {}},
      {"8000:8010,", "8005,", 1, {8005}},
      {"8005,", "8000:8010,", 1, {8005}},
      {"8000:8002,8002:8004,", "8001:8003,", 1, {8001, 8002, 8003}},
      {"80,8000:8001,", "8001,81,80,", 1, {80, 8001}},
      {"8000:8000,", "8000,", 1, {8000}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(std::string("claimed '") + c.claimed + "' candidates '" + c.candidates + "'");
    Outcome outcome = Check(c.claimed, c.candidates);
    EXPECT_EQ(c.result, outcome.result);
    EXPECT_EQ(c.ports, outcome.ports);
  }
}

TEST(TLIBIsPortConflict, MaxConflictsCapsTheList) {
  struct Case {
    int max_conflicts;
    std::vector<int> ports;
  } cases[] = {{1, {1}}, {3, {1, 2, 3}}, {12, {1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12}}};
  for (const Case& c : cases) {
    SCOPED_TRACE(c.max_conflicts);
    Outcome outcome = Check("1:65535", "1:65535", "udp", c.max_conflicts);
    EXPECT_EQ(1, outcome.result);
    EXPECT_EQ(c.ports, outcome.ports);
  }
  Outcome all = Check("1:65535", "1:65535", "tcp", 70000);
  EXPECT_EQ(65535u, all.ports.size());
  EXPECT_EQ(65535, all.ports.back());
}

TEST(TLIBIsPortConflict, RefusesGarbage) {
  struct Case {
    const char* claimed;
    const char* candidates;
    const char* proto;
    int max_conflicts;
  } cases[] = {
      {"0,", "80,", "tcp", 12},     {"80,", "65536,", "tcp", 12}, {"80;443", "80,", "tcp", 12},
      {"80,", "abc,", "tcp", 12},   {"-1,", "80,", "tcp", 12},    {"+80,", "80,", "tcp", 12},
      {"80:", "80,", "tcp", 12},    {":80", "80,", "tcp", 12},    {"1:2:3", "80,", "tcp", 12},
      {"90:80", "85,", "tcp", 12},  {"80,", "8 0,", "tcp", 12},   {"80,", "99999999999,", "tcp", 12},
      {"80,", "80,", "icmp", 12},   {"80,", "80,", "", 12},       {"80,", "80,", "TCP", 12},
      {"80,", "80,", "udp,tcp", 12}, {"80,", "80,", "tcp", 0},    {"80,", "80,", "tcp", -1},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(std::string(c.claimed) + " | " + c.candidates + " | " + c.proto + " | " +
                 std::to_string(c.max_conflicts));
    Outcome outcome = Check(c.claimed, c.candidates, c.proto, c.max_conflicts);
    EXPECT_EQ(-1, outcome.result);
    EXPECT_EQ(EINVAL, outcome.error);
  }
  char list[] = "80,";
  TAVO_SERVICE_PORTS* conflicts = nullptr;
  EXPECT_EQ(-1, TLIBIsPortConflict(nullptr, list, "tcp", 12, &conflicts));
  EXPECT_EQ(-1, TLIBIsPortConflict(list, nullptr, "tcp", 12, &conflicts));
  EXPECT_EQ(-1, TLIBIsPortConflict(list, list, nullptr, 12, &conflicts));
  EXPECT_EQ(-1, TLIBIsPortConflict(list, list, "tcp", 12, nullptr));
  EXPECT_EQ(nullptr, conflicts);
  TAVOServiceConfPortsFree(nullptr);
}

}  // namespace
