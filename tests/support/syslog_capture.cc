#include "support/syslog_capture.h"

#define PCRE2_CODE_UNIT_WIDTH 8
#include <pcre2.h>
#include <syslog.h>
#include <time.h>
#include <unistd.h>

#include <atomic>
#include <cctype>
#include <chrono>
#include <cstdlib>
#include <fstream>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

// The sandbox's syslog sink (tools/sandbox-init) writes each datagram as one
// line, "\" escaped as "\\" and a newline as "\n". These helpers use the C
// library directly so that armed fault hooks of src/base cannot touch them.
namespace tavow3::test {
namespace {

constexpr char kLogFile[] = "/run/tavow3-sandbox/syslog";
constexpr char kMarkerPrefix[] = "tavow3-test-log-marker ";
constexpr auto kMarkerTimeout = std::chrono::seconds(10);

struct Entry {
  int priority;  // severity (LOG_ERR ...), -1 when the line had no "<PRI>"
  std::string message;
};

std::mutex g_mutex;
std::streamoff g_start = 0;  // Guarded by g_mutex: where ClearLog() left off.

std::string Unescape(const std::string& line) {
  std::string out;
  out.reserve(line.size());
  for (size_t i = 0; i < line.size(); ++i) {
    if (line[i] == '\\' && i + 1 < line.size()) {
      ++i;
      out += line[i] == 'n' ? '\n' : line[i];
    } else {
      out += line[i];
    }
  }
  return out;
}

bool IsTimestamp(const std::string& text, size_t at) {
  // "Mmm dd hh:mm:ss " with a space-padded day.
  if (text.size() < at + 16) return false;
  const char* t = text.c_str() + at;
  auto digit = [](char c) { return c >= '0' && c <= '9'; };
  return std::isalpha(static_cast<unsigned char>(t[0])) && t[3] == ' ' &&
         (t[4] == ' ' || digit(t[4])) && digit(t[5]) && t[6] == ' ' && digit(t[7]) && digit(t[8]) &&
         t[9] == ':' && digit(t[10]) && digit(t[11]) && t[12] == ':' && digit(t[13]) &&
         digit(t[14]) && t[15] == ' ';
}

// "<PRI>Mmm dd hh:mm:ss tag[pid]: message"; the tag and pid are optional and a
// tag never holds a space, so "a b: c" without a tag keeps all of its text.
Entry Parse(const std::string& raw) {
  Entry entry{-1, raw};
  size_t close = raw.find('>');
  if (raw.empty() || raw[0] != '<' || close == std::string::npos || close < 2 || close > 4) {
    return entry;
  }
  int pri = 0;
  for (size_t i = 1; i < close; ++i) {
    if (raw[i] < '0' || raw[i] > '9') return entry;
    pri = pri * 10 + (raw[i] - '0');
  }
  entry.priority = LOG_PRI(pri);
  size_t body = close + 1;
  if (IsTimestamp(raw, body)) body += 16;
  size_t colon = raw.find(": ", body);
  size_t space = raw.find(' ', body);
  if (colon != std::string::npos && (space == std::string::npos || space > colon)) {
    body = colon + 2;
  }
  entry.message = raw.substr(body);
  return entry;
}

std::string NewMarker() {
  static std::atomic<unsigned> counter{0};
  timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  return kMarkerPrefix + std::to_string(::getpid()) + "." + std::to_string(counter++) + "." +
         std::to_string(now.tv_nsec);
}

// Reads entries from `start` on. Sets *marker_end to the offset just past the
// marker's line and returns true once the marker is there.
bool ReadUntilMarker(std::streamoff start, const std::string& marker, std::vector<Entry>* entries,
                     std::streamoff* marker_end) {
  entries->clear();
  std::ifstream in(kLogFile);
  if (!in) return false;
  in.seekg(start);
  std::string line;
  while (std::getline(in, line)) {
    if (in.eof()) return false;  // a line still being written
    Entry entry = Parse(Unescape(line));
    if (entry.message == marker) {
      *marker_end = in.tellg();
      return true;
    }
    // Other processes' markers are not messages either.
    if (entry.message.rfind(kMarkerPrefix, 0) != 0) entries->push_back(std::move(entry));
  }
  return false;
}

// Logs a marker and waits until the sink wrote it. Returns the entries after
// the ClearLog() point that came before the marker.
std::vector<Entry> SyncAndRead(std::streamoff* marker_end) {
  std::string marker = NewMarker();
  ::syslog(LOG_ERR, "%s", marker.c_str());
  std::streamoff start;
  {
    std::lock_guard<std::mutex> lock(g_mutex);
    start = g_start;
  }
  std::vector<Entry> entries;
  auto deadline = std::chrono::steady_clock::now() + kMarkerTimeout;
  while (!ReadUntilMarker(start, marker, &entries, marker_end)) {
    if (std::chrono::steady_clock::now() > deadline) {
      ADD_FAILURE() << "the syslog sink did not write \"" << marker << "\" to " << kLogFile
                    << " within 10 s: is this running inside tools/sandbox?";
      return entries;
    }
    std::this_thread::sleep_for(std::chrono::milliseconds(2));
  }
  return entries;
}

}  // namespace

std::vector<std::string> LogMessages() {
  std::streamoff end = 0;
  std::vector<std::string> messages;
  for (Entry& entry : SyncAndRead(&end)) messages.push_back(std::move(entry.message));
  return messages;
}

std::vector<std::string> LogMessages(int priority) {
  std::streamoff end = 0;
  std::vector<std::string> messages;
  for (Entry& entry : SyncAndRead(&end)) {
    if (entry.priority == priority) messages.push_back(std::move(entry.message));
  }
  return messages;
}

std::vector<std::string> TaggedLogMessages(const std::string& tag) {
  std::vector<std::string> tagged;
  for (std::string& message : LogMessages()) {
    if (message.compare(0, tag.size() + 1, tag + ":") == 0) tagged.push_back(std::move(message));
  }
  return tagged;
}

std::vector<std::string> TaggedLogMessages(const std::string& tag, int priority) {
  std::vector<std::string> tagged;
  for (std::string& message : LogMessages(priority)) {
    if (message.compare(0, tag.size() + 1, tag + ":") == 0) tagged.push_back(std::move(message));
  }
  return tagged;
}

std::vector<std::string> LogsMatching(const std::vector<std::string>& messages,
                                      const std::string& pattern) {
  int error;
  PCRE2_SIZE offset;
  pcre2_code* re = pcre2_compile(reinterpret_cast<PCRE2_SPTR>(pattern.c_str()), pattern.size(),
                                 PCRE2_ANCHORED | PCRE2_ENDANCHORED, &error, &offset, nullptr);
  EXPECT_NE(nullptr, re) << "bad pattern " << pattern;
  std::vector<std::string> matching;
  if (re == nullptr) return matching;
  pcre2_match_data* match = pcre2_match_data_create_from_pattern(re, nullptr);
  for (const std::string& m : messages) {
    if (pcre2_match(re, reinterpret_cast<PCRE2_SPTR>(m.data()), m.size(), 0, 0, match, nullptr) >=
        0) {
      matching.push_back(m);
    }
  }
  pcre2_match_data_free(match);
  pcre2_code_free(re);
  return matching;
}

bool HasLogMatching(const std::vector<std::string>& messages, const std::string& pattern) {
  return !LogsMatching(messages, pattern).empty();
}

void ClearLog() {
  std::streamoff end = 0;
  (void)SyncAndRead(&end);
  if (end <= 0) return;
  std::lock_guard<std::mutex> lock(g_mutex);
  g_start = end;
}

}  // namespace tavow3::test
