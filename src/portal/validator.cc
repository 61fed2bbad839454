#include <tavow3/validator.h>

#define PCRE2_CODE_UNIT_WIDTH 8
#include <pcre2.h>
#include <unicode/bytestream.h>
#include <unicode/idna.h>
#include <unicode/stringpiece.h>

#include <memory>

#include "portal/full_match_pattern.h"

namespace tavow3 {
namespace {

using portal::FullMatchPattern;

// Case-insensitive, UTF-8 mode: the options of the address and host-name patterns.
constexpr uint32_t kCaselessUtf = PCRE2_CASELESS | PCRE2_UTF;

// 1 to 15 bytes, none of them white space or `=~!@#$%^&*()_+[]\{}|;:'",/<>?.
constexpr char kNetBIOSPattern[] = R"re([^\s`=~!@#\$%\^&\*()_\+\[\]\\{\}\|;:'",/<>\?\.]{1,15})re";

// One decimal octet 0 to 255 without leading zeros, and a dotted IPv4 address.
#define TAVOW3_OCTET "(?:25[0-5]|2[0-4]\\d|1\\d\\d|[1-9]?\\d)"
#define TAVOW3_IPV4 TAVOW3_OCTET "(?:\\." TAVOW3_OCTET "){3}"

// An IPv4 address with an optional prefix length /0 to /32.
constexpr char kIPv4CIDRPattern[] = TAVOW3_IPV4 "(?:\\/(?:[12]?\\d|3[012]))?";

// An IPv6 address with an optional prefix length /0 to /128. The alternatives
// are the grammar of RFC 3986 (3.2.2), which spells out every textual form of
// RFC 4291 (2.2): eight groups of 1 to 4 hex digits; "::" standing for one to
// eight zero groups ("::" alone included), with at most seven groups written;
// and each of these with the last two groups written as a dotted IPv4 address
// that follows the IPv4 rule above. A zone ("%eth0") is not part of it.
#define TAVOW3_H16 "[0-9a-f]{1,4}"
#define TAVOW3_LS32 "(?:" TAVOW3_H16 ":" TAVOW3_H16 "|" TAVOW3_IPV4 ")"
constexpr char kIPv6CIDRPattern[] =
    "(?:"
    "(?:" TAVOW3_H16 ":){6}" TAVOW3_LS32                                  // 1:2:3:4:5:6:7:8
    "|::(?:" TAVOW3_H16 ":){5}" TAVOW3_LS32                               // ::2:3:4:5:6:7:8
    "|(?:" TAVOW3_H16 ")?::(?:" TAVOW3_H16 ":){4}" TAVOW3_LS32            // 1::3:4:5:6:7:8
    "|(?:(?:" TAVOW3_H16 ":){0,1}" TAVOW3_H16 ")?::(?:" TAVOW3_H16 ":){3}" TAVOW3_LS32
    "|(?:(?:" TAVOW3_H16 ":){0,2}" TAVOW3_H16 ")?::(?:" TAVOW3_H16 ":){2}" TAVOW3_LS32
    "|(?:(?:" TAVOW3_H16 ":){0,3}" TAVOW3_H16 ")?::" TAVOW3_H16 ":" TAVOW3_LS32
    "|(?:(?:" TAVOW3_H16 ":){0,4}" TAVOW3_H16 ")?::" TAVOW3_LS32          // ::ffff:1.2.3.4
    "|(?:(?:" TAVOW3_H16 ":){0,5}" TAVOW3_H16 ")?::" TAVOW3_H16           // 1:2:3:4:5:6::8, ::1
    "|(?:(?:" TAVOW3_H16 ":){0,6}" TAVOW3_H16 ")?::"                      // 1:2:3:4:5:6:7::, ::
    ")"
    "(?:\\/(?:[1-9]?\\d|1[01]\\d|12[0-8]))?";
#undef TAVOW3_LS32
#undef TAVOW3_H16
#undef TAVOW3_IPV4
#undef TAVOW3_OCTET

// Labels of 1 to 63 letters, digits and hyphens, no hyphen at either end,
// separated by single dots, with one optional trailing dot.
constexpr char kSerNamePattern[] =
    R"re([a-z0-9](?:[-a-z0-9]{0,61}[a-z0-9])?(?:\.[a-z0-9](?:[-a-z0-9]{0,61}[a-z0-9])?)*\.?)re";

// The compiled patterns live for the whole process: a static destructor
// running before a late caller's check would leave it a freed pattern.
const FullMatchPattern& NetBIOSPattern() {
  static const FullMatchPattern* pattern = new FullMatchPattern(kNetBIOSPattern, 0);
  return *pattern;
}
const FullMatchPattern& IPv4CIDRPattern() {
  static const FullMatchPattern* pattern = new FullMatchPattern(kIPv4CIDRPattern, kCaselessUtf);
  return *pattern;
}
const FullMatchPattern& IPv6CIDRPattern() {
  static const FullMatchPattern* pattern = new FullMatchPattern(kIPv6CIDRPattern, kCaselessUtf);
  return *pattern;
}
const FullMatchPattern& SerNamePattern() {
  static const FullMatchPattern* pattern = new FullMatchPattern(kSerNamePattern, kCaselessUtf);
  return *pattern;
}

// A host name's ASCII form of this length or more is refused.
constexpr size_t kMaxSerNameBytes = 256;

}  // namespace

bool Validator::IsNetBIOSName(const std::string& name) {
  return NetBIOSPattern().FullMatch(name);
}

bool Validator::IsCIDRValid(const std::string& text) {
  return IPv4CIDRPattern().FullMatch(text) || IPv6CIDRPattern().FullMatch(text);
}

bool Validator::UTF8ToPunycode(const std::string& in, std::string& out) {
  UErrorCode status = U_ZERO_ERROR;
  std::unique_ptr<icu::IDNA> idna(icu::IDNA::createUTS46Instance(UIDNA_DEFAULT, status));
  if (U_FAILURE(status) || !idna) return false;
  std::string ascii;
  icu::StringByteSink<std::string> sink(&ascii);
  icu::IDNAInfo info;
  idna->nameToASCII_UTF8(icu::StringPiece(in.data(), static_cast<int32_t>(in.size())), sink,
                         info, status);
  if (U_FAILURE(status) || info.hasErrors()) return false;
  out += ascii;
  return true;
}

bool Validator::IsSerNameValid(const std::string& name) {
  std::string ascii;
  if (!UTF8ToPunycode(name, ascii)) return false;
  if (ascii.size() >= kMaxSerNameBytes) return false;
  return SerNamePattern().FullMatch(ascii);
}

}  // namespace tavow3
