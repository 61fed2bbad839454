// A hand-written matcher for kTcpTableLineFormat. sscanf builds the scan set
// and dispatches on the format for every line; on tables of tens of thousands
// of sockets that costs a third of what the kernel takes to print them. This
// matcher follows glibc's scanf rules step by step, so that accept/reject and
// values agree with sscanf (tests compare the two on generated and mutated
// lines).
#include <cstdint>

#include "engine/tcp_table.h"

namespace tavow3 {
namespace {

constexpr uint8_t kNotDigit = 0xff;

// Digit value of each byte in base 16 (decimal digits are its first ten).
// NUL is no digit: the text's end stops every run.
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

inline unsigned DigitOf(char c) { return kDigits.value[static_cast<unsigned char>(c)]; }

// isspace() of the C locale.
inline bool IsSpace(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

// The input of one match, a C string: the NUL byte at its end matches
// nothing in the format, so every step stops there as sscanf's does.
class Scanner {
 public:
  explicit Scanner(const char* text) : p_(text) {}

  // A white-space directive: any amount, none included.
  void SkipSpace() {
    while (IsSpace(*p_)) ++p_;
  }

  // An ordinary format character: must be the next byte, no space skipped.
  bool Literal(char c) {
    if (*p_ != c) return false;
    ++p_;
    return true;
  }

  // "%*64[0-9A-Fa-f]": 1 to `width` hexadecimal digits, no space skipped.
  bool HexRun(int width) {
    int count = 0;
    while (count < width && DigitOf(p_[count]) != kNotDigit) ++count;
    p_ += count;
    return count > 0;
  }

  // The syntax of an integer conversion ("%d", "%x", "%llu") as glibc scans
  // it: leading space skipped, an optional sign, for base 16 an "x" after a
  // leading zero (consumed even when no digit follows), then digits. Returns
  // where the digits start, or null when there was no digit.
  template <unsigned kBase>
  const char* Conversion(bool* negative) {
    SkipSpace();
    *negative = *p_ == '-';
    if (*p_ == '+' || *p_ == '-') ++p_;
    const char* digits = p_;
    bool any_digit = false;
    if (*p_ == '0') {
      any_digit = true;
      ++p_;
      if (kBase == 16 && (*p_ | 0x20) == 'x') ++p_;
    }
    while (DigitOf(*p_) < kBase) {
      any_digit = true;
      ++p_;
    }
    return any_digit ? digits : nullptr;
  }

  // A conversion whose value is stored: the text is converted as
  // strtoul/strtoull convert it, saturating at the maximum of T, a "-" sign
  // negating modulo 2^N.
  template <unsigned kBase, typename T>
  bool Number(T* value) {
    bool negative = false;
    const char* digits = Conversion<kBase>(&negative);
    if (digits == nullptr) return false;
    constexpr T kMax = static_cast<T>(~T{0});
    constexpr T kCutoff = kMax / kBase;
    constexpr unsigned kCutlim = static_cast<unsigned>(kMax % kBase);
    T magnitude = 0;
    for (const char* d = digits; d != p_; ++d) {
      const unsigned digit = DigitOf(*d);
      if (digit >= kBase) continue;  // the "x" of a "0x" prefix
      if (magnitude > kCutoff || (magnitude == kCutoff && digit > kCutlim)) {
        *value = kMax;
        return true;
      }
      magnitude = magnitude * kBase + digit;
    }
    *value = negative ? static_cast<T>(-magnitude) : magnitude;
    return true;
  }

  // A suppressed conversion: only its syntax counts.
  template <unsigned kBase>
  bool Skip() {
    bool negative;
    return Conversion<kBase>(&negative) != nullptr;
  }

 private:
  const char* p_;
};

// Reads exactly kCount hexadecimal digits followed by `separator` and moves
// past them; false (text unmoved) otherwise. Stops at the first byte that
// does not fit, so it never reads past the terminating NUL.
template <int kCount>
__attribute__((always_inline)) inline bool FixedHex(const char** text, char separator, unsigned* value) {
  const char* p = *text;
  unsigned result = 0;
  for (int i = 0; i < kCount; ++i) {
    const unsigned digit = DigitOf(p[i]);
    if (digit > 15) return false;
    result = result * 16 + digit;
  }
  if (p[kCount] != separator) return false;
  *text = p + kCount + 1;
  *value = result;
  return true;
}

// Skips spaces, then decimal digits; false when there is no digit.
__attribute__((always_inline)) inline bool SpacesThenDigits(const char** text) {
  const char* p = *text;
  while (*p == ' ') ++p;
  const char* digits = p;
  while (DigitOf(*p) < 10) ++p;
  *text = p;
  return p != digits;
}

// A hexadecimal address of 8 (IPv4) or 32 (IPv6) digits and its ":".
inline bool Address(const char** text) {
  const char* p = *text;
  int count = 0;
  while (count <= 32 && DigitOf(p[count]) <= 15) ++count;
  if ((count != 8 && count != 32) || p[count] != ':') return false;
  *text = p + count + 1;
  return true;
}

// The layout the kernel prints ("%4d: %08X:%04X %08X:%04X %02X %08X:%08X
// %02X:%08lX %08X %5u %8d %lu ..."), recognised with fixed field widths.
// Accepts only lines that the format accepts with these values; false means
// "not this layout", and the general matcher decides.
bool ParseKernelLayout(const char* p, TcpTableLine* line) {
  unsigned port, state, ignored;
  if (!SpacesThenDigits(&p) || p[0] != ':' || p[1] != ' ') return false;
  p += 2;
  if (!Address(&p) || !FixedHex<4>(&p, ' ', &port)) return false;
  if (!Address(&p) || !FixedHex<4>(&p, ' ', &ignored)) return false;
  if (!FixedHex<2>(&p, ' ', &state)) return false;
  // tx_queue:rx_queue tr:tm->when retrnsmt
  if (!FixedHex<8>(&p, ':', &ignored) || !FixedHex<8>(&p, ' ', &ignored) ||
      !FixedHex<2>(&p, ':', &ignored) || !FixedHex<8>(&p, ' ', &ignored) ||
      !FixedHex<8>(&p, ' ', &ignored)) {
    return false;
  }
  // uid, timeout (may be negative: the sign directly before the digits),
  // inode of at most 19 digits (no overflow)
  if (!SpacesThenDigits(&p) || *p != ' ') return false;
  while (*p == ' ') ++p;
  if (*p == '-') ++p;
  if (DigitOf(*p) > 9 || !SpacesThenDigits(&p) || *p != ' ') return false;
  while (*p == ' ') ++p;
  unsigned long long inode = 0;
  int digits = 0;
  for (; DigitOf(*p) < 10; ++p, ++digits) inode = inode * 10 + DigitOf(*p);
  if (digits == 0 || digits > 19) return false;
  line->local_port = static_cast<unsigned short>(port);
  line->state = state;
  line->inode = inode;
  return true;
}

// Everything the format accepts, step by step.
bool ParseGeneral(const char* text, TcpTableLine* line) {
  Scanner in(text);
  // "%*d: %*64[0-9A-Fa-f]:"
  if (!in.Skip<10>() || !in.Literal(':')) return false;
  in.SkipSpace();
  if (!in.HexRun(64) || !in.Literal(':')) return false;
  // "%hx"
  unsigned long port = 0;
  if (!in.Number<16>(&port)) return false;
  // " %*64[0-9A-Fa-f]:%*X "
  in.SkipSpace();
  if (!in.HexRun(64) || !in.Literal(':') || !in.Skip<16>()) return false;
  // "%X"
  unsigned long state = 0;
  in.SkipSpace();
  if (!in.Number<16>(&state)) return false;
  // " %*X:%*X %*X:%*X %*X %*d %*d "
  if (!in.Skip<16>() || !in.Literal(':') || !in.Skip<16>() || !in.Skip<16>() ||
      !in.Literal(':') || !in.Skip<16>() || !in.Skip<16>() || !in.Skip<10>() ||
      !in.Skip<10>()) {
    return false;
  }
  // "%llu"
  unsigned long long inode = 0;
  in.SkipSpace();
  if (!in.Number<10>(&inode)) return false;
  line->local_port = static_cast<unsigned short>(port);
  line->state = static_cast<unsigned int>(state);
  line->inode = inode;
  return true;
}

}  // namespace

bool ParseTcpTableLine(const char* text, TcpTableLine* line) {
  return ParseKernelLayout(text, line) || ParseGeneral(text, line);
}

}  // namespace tavow3
