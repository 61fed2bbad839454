// A hand-written matcher for kTcpTableLineFormat. sscanf builds the scan set
// and dispatches on the format for every line; on tables of tens of thousands
// of sockets that cost more than the kernel takes to print them. This matcher
// follows glibc's scanf rules step by step, so that accept/reject and values
// agree with sscanf (tests compare the two on generated and mutated lines).
#include <climits>
#include <cstdint>

#include "engine/tcp_table.h"

namespace tavow3 {
namespace {

constexpr uint8_t kNotDigit = 0xff;

// Digit value of each byte in base 16 (decimal digits are its first ten).
struct DigitTable {
  uint8_t value[256];
  constexpr DigitTable() : value() {
    for (int c = 0; c < 256; ++c) value[c] = kNotDigit;
    for (int c = '0'; c <= '9'; ++c) value[c] = static_cast<uint8_t>(c - '0');
    for (int c = 'a'; c <= 'f'; ++c) value[c] = static_cast<uint8_t>(c - 'a' + 10);
    for (int c = 'A'; c <= 'F'; ++c) value[c] = static_cast<uint8_t>(c - 'A' + 10);
  }
};
constexpr DigitTable kDigits;

// isspace() of the C locale.
inline bool IsSpace(int c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

// The input of one match. A NUL byte matches nothing in the format, so the
// match stops there as sscanf's stops at the end of its string.
class Scanner {
 public:
  Scanner(const char* begin, const char* end) : p_(begin), end_(end) {}

  // The next byte, or -1 at the end of the input.
  int Peek() const { return p_ != end_ ? static_cast<unsigned char>(*p_) : -1; }
  void Advance() { ++p_; }

  // A white-space directive: any amount, none included.
  void SkipSpace() {
    while (IsSpace(Peek())) Advance();
  }

  // An ordinary format character: must be the next byte, no space skipped.
  bool Literal(char c) {
    if (Peek() != static_cast<unsigned char>(c)) return false;
    Advance();
    return true;
  }

  // "%*64[0-9A-Fa-f]": 1 to `width` hexadecimal digits, no space skipped.
  bool HexRun(int width) {
    int count = 0;
    while (count < width && Peek() >= 0 && kDigits.value[Peek()] != kNotDigit) {
      Advance();
      ++count;
    }
    return count > 0;
  }

  // An integer conversion ("%d", "%x", "%llu") as glibc scans it: leading
  // space skipped, an optional sign, for base 16 a "0x" after a leading zero,
  // then digits; the text read is converted as strtoul/strtoull convert it
  // (saturating at the maximum of T, a sign of "-" negating modulo 2^N).
  // False when no digit was read.
  template <typename T>
  bool Number(unsigned base, T* value) {
    SkipSpace();
    int c = Peek();
    bool negative = false;
    if (c == '+' || c == '-') {
      negative = c == '-';
      Advance();
      c = Peek();
    }
    bool any_digit = false;
    if (c == '0') {
      any_digit = true;
      Advance();
      c = Peek();
      // The "x" is consumed even when no hexadecimal digit follows it.
      if (base == 16 && (c == 'x' || c == 'X')) {
        Advance();
        c = Peek();
      }
    }
    const T cutoff = static_cast<T>(~T{0}) / base;
    const unsigned cutlim = static_cast<unsigned>(static_cast<T>(~T{0}) % base);
    T magnitude = 0;
    bool overflow = false;
    for (unsigned digit; c >= 0 && (digit = kDigits.value[c]) < base; c = Peek()) {
      any_digit = true;
      if (magnitude > cutoff || (magnitude == cutoff && digit > cutlim)) {
        overflow = true;
      } else {
        magnitude = magnitude * base + digit;
      }
      Advance();
    }
    if (!any_digit) return false;
    *value = overflow ? static_cast<T>(~T{0}) : negative ? static_cast<T>(-magnitude) : magnitude;
    return true;
  }

  // A suppressed conversion of type unsigned long: only its syntax counts.
  bool Skip(unsigned base) {
    unsigned long ignored;
    return Number(base, &ignored);
  }

  // A white-space directive followed by a suppressed conversion.
  bool SpaceSkip(unsigned base) {
    SkipSpace();
    return Skip(base);
  }

  // "%*X:%*X", preceded by a white-space directive.
  bool SpaceHexPair() { return SpaceSkip(16) && Literal(':') && Skip(16); }

 private:
  const char* p_;
  const char* end_;
};

}  // namespace

bool ParseTcpTableLine(const char* begin, const char* end, TcpTableLine* line) {
  Scanner in(begin, end);
  // "%*d: %*64[0-9A-Fa-f]:%hx"
  unsigned long port = 0;
  if (!in.Skip(10) || !in.Literal(':')) return false;
  in.SkipSpace();
  if (!in.HexRun(64) || !in.Literal(':') || !in.Number(16, &port)) return false;
  // " %*64[0-9A-Fa-f]:%*X"
  in.SkipSpace();
  if (!in.HexRun(64) || !in.Literal(':') || !in.Skip(16)) return false;
  // " %X %*X:%*X %*X:%*X %*X %*d %*d %llu"
  unsigned long state = 0;
  unsigned long long inode = 0;
  in.SkipSpace();
  if (!in.Number(16, &state) || !in.SpaceHexPair() || !in.SpaceHexPair() || !in.SpaceSkip(16) ||
      !in.SpaceSkip(10) || !in.SpaceSkip(10)) {
    return false;
  }
  in.SkipSpace();
  if (!in.Number(10, &inode)) return false;
  line->local_port = static_cast<unsigned short>(port);
  line->state = static_cast<unsigned int>(state);
  line->inode = inode;
  return true;
}

}  // namespace tavow3
