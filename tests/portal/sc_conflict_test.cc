// Validator::CheckSCConflict against real service files in the sandbox.
#include <gtest/gtest.h>
#include <tavow3/validator.h>
#include <unistd.h>

#include <set>
#include <string>
#include <vector>

#include "support/syslog_capture.h"
#include "support/test_files.h"

namespace tavow3 {
namespace {

using test::ClearLog;
using test::TaggedLogMessages;
using test::WriteBytes;

constexpr char kOwnFile[] = "/usr/tavo/etc/services.d/tavow3.sc";
constexpr char kPackageFile[] = "/usr/local/etc/services.d/Pagora.sc";

std::string Section(const std::string& name, const std::string& ports,
                    const std::string& protocol) {
  return "[" + name + "]\ntitle=\"HTTP\"\ndesc=\"" + name + "\"\nports=\"" + ports +
         "\"\nprotocol=\"" + protocol + "\"\n\n";
}

std::vector<std::string> ConflictLines(const std::vector<int>& ports) {
  std::vector<std::string> lines;
  for (int port : ports) lines.push_back("validator:143 Port " + std::to_string(port) + " conflict!");
  return lines;
}

struct Probe {
  std::set<unsigned short> ports;
  bool free;
  std::vector<int> logged;
};

// Runs each probe through the set form (and the single-port form for one port).
void CheckProbes(const std::vector<Probe>& probes) {
  for (const Probe& probe : probes) {
    std::string shown;
    for (unsigned short port : probe.ports) shown += std::to_string(port) + " ";
    SCOPED_TRACE("ports { " + shown + "}");
    std::set<unsigned short> ports = probe.ports;
    ClearLog();
    EXPECT_EQ(probe.free, Validator::CheckSCConflict(ports));
    EXPECT_EQ(ConflictLines(probe.logged), TaggedLogMessages("validator"));
    EXPECT_EQ(probe.ports, ports);
    if (probe.ports.size() == 1) {
      ClearLog();
      EXPECT_EQ(probe.free, Validator::CheckSCConflict(*probe.ports.begin()));
      EXPECT_EQ(ConflictLines(probe.logged), TaggedLogMessages("validator"));
    }
  }
}

TEST(CheckSCConflict, NoServiceFilesClaimNothing) {
  CheckProbes({
      {{}, true, {}},
      {{80}, true, {}},
      {{1, 443, 5000, 65535}, true, {}},
  });
}

TEST(CheckSCConflict, PortsOfBothFilesAreClaimed) {
  WriteBytes(kOwnFile, Section("zma", "5000", "tcp") + Section("zma_https", "5001", "tcp") +
                               Section("http_extra", "8000:8010", "tcp") +
                               Section("media", "7000", "udp"));
  WriteBytes(kPackageFile, Section("Pagora_80", "9000,9443", "tcp"));
  CheckProbes({
      {{}, true, {}},
      {{80}, true, {}},
      {{5000}, false, {5000}},
      {{5001}, false, {5001}},
      {{7999}, true, {}},
      {{8000}, false, {8000}},
      {{8010}, false, {8010}},
      {{8011}, true, {}},
      {{7000}, false, {7000}},  // a UDP section's ports count too
      {{9443}, false, {9443}},
      {{9001}, true, {}},
      {{80, 9443, 5001, 8005, 8011}, false, {5001, 8005, 9443}},
  });
}

TEST(CheckSCConflict, EitherFileAloneClaims) {
  WriteBytes(kPackageFile, Section("Pagora_80", "9000", "tcp"));
  CheckProbes({{{9000}, false, {9000}}, {{5000}, true, {}}});
  WriteBytes(kOwnFile, Section("zma", "5000", "tcp"));
  ASSERT_EQ(0, ::unlink(kPackageFile));
  CheckProbes({{{9000}, true, {}}, {{5000}, false, {5000}}});
}

// At most twelve conflicts come back, so at most twelve lines are logged.
TEST(CheckSCConflict, ReportsTwelveConflictsAtMost) {
  WriteBytes(kOwnFile, Section("range", "1000:2000", "tcp"));
  std::set<unsigned short> ports;
  for (unsigned short port = 1000; port < 1020; ++port) ports.insert(port);
  std::vector<int> first_twelve;
  for (int port = 1000; port < 1012; ++port) first_twelve.push_back(port);
  CheckProbes({{ports, false, first_twelve}});
}

// A file that cannot be read or parsed claims nothing; the other still does.
TEST(CheckSCConflict, UnreadableFileClaimsNothing) {
  WriteBytes(kPackageFile, Section("Pagora_80", "9000", "tcp"));
  test::MakeDirs(kOwnFile);  // a directory where the file should be
  CheckProbes({{{9000}, false, {9000}}, {{5000}, true, {}}});

  ASSERT_EQ(0, ::rmdir(kOwnFile));
  WriteBytes(kOwnFile, Section("zma", "5000", "tcp") + Section("bad", "http", "tcp"));
  CheckProbes({{{9000}, false, {9000}}, {{5000}, true, {}}});
}

}  // namespace
}  // namespace tavow3
