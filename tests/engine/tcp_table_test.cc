// The hand-written table-line matcher against sscanf with the same format, and
// the table reader against fgets + sscanf on the same file.
#include "engine/tcp_table.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <random>
#include <string>
#include <vector>

#include "sockets.h"

namespace tavow3 {
namespace {

struct Outcome {
  bool accepted = false;
  TcpTableLine line;
};

Outcome ByScanf(const std::string& text) {
  Outcome outcome;
  outcome.accepted = std::sscanf(text.c_str(), kTcpTableLineFormat, &outcome.line.local_port,
                                 &outcome.line.state, &outcome.line.inode) == 3;
  return outcome;
}

Outcome ByMatcher(const std::string& text) {
  Outcome outcome;
  outcome.accepted = ParseTcpTableLine(text.c_str(), &outcome.line);
  return outcome;
}

// Both must accept or reject alike and agree on every value.
void ExpectAgreement(const std::string& text, int* accepted) {
  const Outcome expected = ByScanf(text);
  const Outcome actual = ByMatcher(text);
  ASSERT_EQ(expected.accepted, actual.accepted) << "line: [" << text << "]";
  if (!expected.accepted) return;
  ++*accepted;
  ASSERT_EQ(expected.line.local_port, actual.line.local_port) << "line: [" << text << "]";
  ASSERT_EQ(expected.line.state, actual.line.state) << "line: [" << text << "]";
  ASSERT_EQ(expected.line.inode, actual.line.inode) << "line: [" << text << "]";
}

std::string Hex(std::mt19937& rng, int digits, bool upper = true) {
  static const char kUpper[] = "0123456789ABCDEF";
  static const char kLower[] = "0123456789abcdef";
  const char* const alphabet = upper ? kUpper : kLower;
  std::string text(static_cast<size_t>(digits), '0');
  for (char& digit : text) digit = alphabet[rng() % 16];
  return text;
}

std::string Decimal(std::mt19937& rng, int digits) {
  std::string text;
  for (int i = 0; i < digits; ++i) text += static_cast<char>('0' + rng() % 10);
  return text;
}

// A line as the kernel prints it, IPv4 (8-digit addresses) or IPv6 (32).
std::string KernelLine(std::mt19937& rng) {
  const int address_digits = rng() % 2 ? 8 : 32;
  char line[512];
  std::snprintf(line, sizeof line,
                "%4u: %s:%s %s:%s %s %s:%s %s:%s %s %5u %8u %s 1 0000000000000000 100 0 0 10 0\n",
                static_cast<unsigned>(rng() % 100000), Hex(rng, address_digits).c_str(),
                Hex(rng, 4).c_str(), Hex(rng, address_digits).c_str(), Hex(rng, 4).c_str(),
                Hex(rng, 2).c_str(), Hex(rng, 8).c_str(), Hex(rng, 8).c_str(),
                Hex(rng, 2).c_str(), Hex(rng, 8).c_str(), Hex(rng, 8).c_str(),
                static_cast<unsigned>(rng() % 70000), static_cast<unsigned>(rng() % 100),
                Decimal(rng, 1 + static_cast<int>(rng() % 12)).c_str());
  return line;
}

// Small pieces that exercise scanf's corners: signs, "0x" prefixes, white
// space of every kind, NUL, over-long runs and numbers that overflow.
std::string Fragment(std::mt19937& rng) {
  static const char* const kPieces[] = {
      " ", "\t", "\n", "\v", "\f", "\r", ":", "::", "-", "+", "0", "0x", "0X", "x", "00x",
      "-0x", "+0x1", "g", "G", "]", "%", "" /* a NUL byte */, "\x80", "\xff",
      "ffffffffffffffff", "10000000000000000", "ffffffff", "100000000",
      "18446744073709551615", "18446744073709551616", "99999999999999999999999",
      "-1", "-18446744073709551616", "FFFF", "10000", "-FFFF"};
  const size_t index = rng() % (sizeof kPieces / sizeof kPieces[0]);
  if (kPieces[index][0] == '\0') return std::string(1, '\0');
  return kPieces[index];
}

std::string Mutate(std::string line, std::mt19937& rng) {
  const int edits = 1 + static_cast<int>(rng() % 4);
  for (int i = 0; i < edits; ++i) {
    const size_t at = line.empty() ? 0 : rng() % (line.size() + 1);
    switch (rng() % 7) {
      case 0:  // replace one byte
        if (at < line.size()) line[at] = Fragment(rng)[0];
        break;
      case 1:  // insert a fragment
        line.insert(at, Fragment(rng));
        break;
      case 2:  // delete a run
        if (at < line.size()) line.erase(at, 1 + rng() % 6);
        break;
      case 3:  // cut the line short
        line.resize(at);
        break;
      case 4:  // repeat a run of hex digits (address runs around 64)
        line.insert(at, Hex(rng, static_cast<int>(rng() % 70), rng() % 2));
        break;
      case 5:  // blank out a separator
        if (at < line.size() && (line[at] == ' ' || line[at] == ':')) line.erase(at, 1);
        break;
      default:  // a long decimal or hex number
        line.insert(at, rng() % 2 ? Decimal(rng, 15 + static_cast<int>(rng() % 10))
                                  : Hex(rng, 7 + static_cast<int>(rng() % 12)));
        break;
    }
  }
  return line;
}

TEST(TcpTableLine, MatchesScanfOnChosenLines) {
  const std::string kernel4 =
      "   0: 0100007F:1F90 00000000:0000 0A 00000000:00000000 00:00000000 00000000     0        "
      "0 24871 1 0000000000000000 100 0 0 10 0\n";
  const std::vector<std::string> lines = {
      kernel4,
      "  sl  local_address rem_address   st tx_queue rx_queue tr tm->when retrnsmt   uid  "
      "timeout inode\n",
      "   1: 00000000000000000000000001000000:0050 00000000000000000000000000000000:0000 0A "
      "00000000:00000000 00:00000000 00000000     0        0 31337 1 ffff 100 0 0 10 0",
      // 64 hex digits are the most an address may have; 65 fail.
      "0: " + std::string(64, 'a') + ":1 " + std::string(64, 'F') + ":2 0A 0:0 0:0 0 0 0 7",
      "0: " + std::string(65, 'a') + ":1 0:2 0A 0:0 0:0 0 0 0 7",
      "0: 1:1 " + std::string(65, '0') + ":2 0A 0:0 0:0 0 0 0 7",
      // Prefixes, signs and overflow where scanf allows them.
      "-3: 1:0x50 1:0X 0x0a +0:-0 0:0 0 -1 +2 0x12",
      "0: 1:-1 1:1 -1 1:1 1:1 1 1 1 -1",
      "0: 1:10000 1:1 100000001 1:1 1:1 1 1 1 18446744073709551616",
      "0: 1:0x 1:0x 0x 0x:0x 0x:0x 0x 0 0 0",
      "0: 1:0xg 1:1 1 1:1 1:1 1 1 1 1",
      // White space of every kind between fields, none where a literal follows.
      "\t0:\v1:\f50\r1:1\n1\n1:1 1:1 1 1 1 \t 99",
      "0 : 1:50 1:1 1 1:1 1:1 1 1 1 1",
      "0: 1 :50 1:1 1 1:1 1:1 1 1 1 1",
      "0: 1:50 1:1 1 1 :1 1:1 1 1 1 1",
      "0:1:50 1:1 1 1:1 1:1 1 1 1 1",
      "0: 1:50 1:1 1 1:1 1:1 1 1 1",
      "0: 1:50 1:1 1 1:1 1:1 1 1 1 +",
      // The kernel's layout with a sign or space where only the general rules apply.
      "   1: 0100007F:0050 00000000:0000 0A 00000000:00000000 00:00000000 00000000     0 -   "
      "   0 99 1",
      "   1: 0100007F:0050 00000000:0000 0A 00000000:00000000 00:00000000 00000000     0 -7 99",
      "   1: 0100007F:0050 00000000:0000 0A 00000000:00000000 00:00000000 00000000    -1 0 99",
      "   1: 0100007F:0050 00000000:0000 0A 00000000:00000000 00:00000000 00000000     0 0 "
      "12345678901234567890",
      "   1: 0100007F:0050 00000000:0000 0A 00000000:00000000 00:00000000 00000000     0 0 "
      "1234567890123456789",
      "   1: 0100007F:0050 00000000:0000 0A 00000000:00000000 00:00000000 00000000     0 0 "
      "99999999999999999999",
      "   1: 0100007F:0050\t00000000:0000 0A 00000000:00000000 00:00000000 00000000 0 0 5",
      "   1: 0100007F0:0050 00000000:0000 0A 00000000:00000000 00:00000000 00000000 0 0 5",
      "  +1: 0100007F:0050 00000000:0000 0A 00000000:00000000 00:00000000 00000000 0 0 5",
      std::string("0: 1:50 1:1 1 1:1 1:1 1 1 1 4") + '\0' + "2",
      std::string("0: 1:5") + '\0' + "0 1:1 1 1:1 1:1 1 1 1 4",
      "",
      " ",
      "0",
  };
  int accepted = 0;
  for (const std::string& line : lines) {
    SCOPED_TRACE(line);
    ExpectAgreement(line, &accepted);
  }
  EXPECT_GE(accepted, 8);
  Outcome kernel = ByMatcher(kernel4);
  ASSERT_TRUE(kernel.accepted);
  EXPECT_EQ(0x1F90, kernel.line.local_port);
  EXPECT_EQ(10u, kernel.line.state);
  EXPECT_EQ(24871u, kernel.line.inode);
}

TEST(TcpTableLine, MatchesScanfOnGeneratedAndMutatedLines) {
  std::mt19937 rng(20240611);
  int accepted = 0;
  constexpr int kLines = 100000;
  for (int i = 0; i < kLines; ++i) {
    const std::string kernel = KernelLine(rng);
    ExpectAgreement(kernel, &accepted);
    ExpectAgreement(Mutate(kernel, rng), &accepted);
    if (HasFatalFailure()) return;
  }
  // Random bytes from a small alphabet: mostly rejections.
  for (int i = 0; i < 20000; ++i) {
    std::string line;
    const int pieces = static_cast<int>(rng() % 40);
    for (int k = 0; k < pieces; ++k) line += Fragment(rng);
    ExpectAgreement(line, &accepted);
    if (HasFatalFailure()) return;
  }
  // Both outcomes are well represented, so neither side of the comparison is idle.
  EXPECT_GT(accepted, kLines + kLines / 5);
  EXPECT_LT(accepted, 2 * kLines);
}

// The reader yields what fgets(1024) + sscanf yield on the same file: lines
// across buffer refills, a line longer than 1023 bytes split in pieces, and a
// last line without a newline.
TEST(TcpTableReader, YieldsWhatFgetsAndScanfYield) {
  std::mt19937 rng(7);
  std::string text = "  sl  local_address rem_address   st tx_queue rx_queue\n";
  for (int i = 0; i < 4000; ++i) {
    std::string line = KernelLine(rng);
    if (i % 97 == 0) line = Mutate(line, rng);
    if (i % 501 == 0) line = std::string(1023 + rng() % 3, 'x') + line;
    if (i % 733 == 0) line = std::string(1500, ' ') + line;
    text += line;
  }
  text += "   9: 0100007F:0016 00000000:0000 0A 0:0 0:0 0 0 0 4242";
  const std::string path = "/tmp/tcp_table_sample";
  test::WriteTestFile(path, text);
  ASSERT_GT(text.size(), 4 * TcpTableReader::kBufferSize);

  std::vector<Outcome> expected;
  FILE* file = std::fopen(path.c_str(), "r");
  ASSERT_NE(nullptr, file);
  char buffer[1024];
  while (std::fgets(buffer, sizeof buffer, file) != nullptr) {
    Outcome outcome = ByScanf(buffer);
    if (outcome.accepted) expected.push_back(outcome);
  }
  std::fclose(file);

  TcpTableReader reader(path);
  ASSERT_TRUE(reader.is_open());
  std::vector<Outcome> actual;
  Outcome outcome;
  while (reader.Next(&outcome.line)) actual.push_back(outcome);
  ASSERT_EQ(expected.size(), actual.size());
  for (size_t i = 0; i < expected.size(); ++i) {
    SCOPED_TRACE(i);
    EXPECT_EQ(expected[i].line.local_port, actual[i].line.local_port);
    EXPECT_EQ(expected[i].line.state, actual[i].line.state);
    EXPECT_EQ(expected[i].line.inode, actual[i].line.inode);
  }
  EXPECT_EQ(4242u, actual.back().line.inode);
  EXPECT_FALSE(TcpTableReader("/tmp/no_such_table").is_open());
}

}  // namespace
}  // namespace tavow3
