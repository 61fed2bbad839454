#include "manager_fixtures.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <vector>

#include <gtest/gtest.h>

#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::test {
namespace {

constexpr size_t kRecordSize = 4096;

}  // namespace

bool GenerationLockIsFree() { return CanFlock("/run/lock/nginx_gen.lock", LOCK_EX); }

bool HasDefaultRule() {
  const std::vector<std::string> rules = IptablesRules();
  return std::find(rules.begin(), rules.end(), kDefaultRule) != rules.end();
}

void WriteModeRecord(const std::string& text) {
  const int fd = ::shm_open("nginx_mod", O_RDWR | O_CREAT, 0644);
  ASSERT_GE(fd, 0) << std::strerror(errno);
  ASSERT_EQ(0, ::ftruncate(fd, kRecordSize));
  char record[kRecordSize] = {};
  std::memcpy(record, text.data(), std::min(text.size(), kRecordSize));
  ASSERT_EQ(static_cast<ssize_t>(kRecordSize), ::pwrite(fd, record, kRecordSize, 0));
  ::close(fd);
}

std::string ModeRecordText() {
  const int fd = ::shm_open("nginx_mod", O_RDONLY, 0);
  if (fd < 0) return "<none>";
  char record[kRecordSize + 1] = {};
  const ssize_t n = ::pread(fd, record, kRecordSize, 0);
  ::close(fd);
  return n < 0 ? "<unreadable>" : std::string(record);
}

void BreakFirewallFile() {
  RemoveTree("/usr/tavo/etc/services.d/tavow3.sc");
  WriteBytes("/usr/tavo/etc/services.d/tavow3.sc/keep", "");
}

void BreakCertificates() { WriteBytes("/usr/tavo/etc/tls/services.json", "not json"); }

void PretendNginxRuns() { WriteBytes("/run/nginx.pid", std::to_string(::getpid()) + "\n"); }

}  // namespace tavow3::test
