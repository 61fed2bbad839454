// NetBIOS names, IPv4 ranges and host names through their ASCII form.
#include <tavow3/validator.h>

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace tavow3 {
namespace {

struct Case {
  std::string text;
  bool valid;
};

std::string Repeat(const std::string& piece, int count) {
  std::string text;
  for (int i = 0; i < count; ++i) text += piece;
  return text;
}

std::string Printable(const std::string& text) {
  std::string shown;
  for (unsigned char c : text) {
    if (c >= 0x20 && c < 0x7f) {
      shown += static_cast<char>(c);
    } else {
      char escape[8];
      std::snprintf(escape, sizeof escape, "\\x%02x", c);
      shown += escape;
    }
  }
  return "\"" + shown + "\" (" + std::to_string(text.size()) + " bytes)";
}

constexpr char kUmlaut[] = "\xc3\xbc";  // U+00FC, two bytes
constexpr char kEuro[] = "\xe2\x82\xac";  // U+20AC, three bytes

TEST(IsNetBIOSName, LengthAndNamedCases) {
  const std::vector<Case> cases = {
      {"NAS-01", true},
      {"a", true},
      {"-", true},
      {"123456789012345", true},
      {"1234567890123456", false},
      {"", false},
      {"my_nas", false},
      {"a.b", false},
      {"my nas", false},
      {" nas", false},
      {"nas ", false},
      {"nas\n", false},
      {Repeat(kUmlaut, 7) + "a", true},  // 8 characters, 15 bytes
      {Repeat(kUmlaut, 8), false},       // 8 characters, 16 bytes
      {Repeat(kEuro, 5), true},          // 15 bytes
      {Repeat(kEuro, 5) + "a", false},   // 6 characters, 16 bytes
      {"\xff\xfe", true},                // bytes, not characters: no UTF-8 check
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(Printable(c.text));
    EXPECT_EQ(c.valid, Validator::IsNetBIOSName(c.text));
  }
}

// Every byte value once, between two letters: exactly white space and the 31
// listed punctuation characters are refused.
TEST(IsNetBIOSName, EveryByteBetweenLetters) {
  const std::string refused = "`=~!@#$%^&*()_+[]\\{}|;:'\",/<>?.";
  ASSERT_EQ(31u, refused.size());
  const std::string blanks = " \t\n\v\f\r";
  int refused_count = 0;
  for (int byte = 0; byte < 256; ++byte) {
    const char c = static_cast<char>(byte);
    const std::string name = std::string("a") + c + "b";
    SCOPED_TRACE(Printable(name));
    const bool expected = refused.find(c) == std::string::npos &&
                          blanks.find(c) == std::string::npos;
    EXPECT_EQ(expected, Validator::IsNetBIOSName(name));
    if (!expected) ++refused_count;
  }
  EXPECT_EQ(37, refused_count);
}

std::vector<Case> IPv4Cases() {
  std::vector<Case> cases = {
      {"192.168.1.0/24", true},
      {"10.0.0.1", true},
      {"0.0.0.0", true},
      {"0.0.0.0/0", true},
      {"255.255.255.255/32", true},
      {"256.1.1.1", false},
      {"01.2.3.4", false},
      {"1.2.3.04", false},
      {"1.2.3.00", false},
      {"10.0.0.0/33", false},
      {"10.0.0.0/01", false},
      {"10.0.0.0/", false},
      {"10.0.0.0/-1", false},
      {"10.0.0.0/24/8", false},
      {"1.2.3", false},
      {"1.2.3.4.5", false},
      {"1..2.3", false},
      {"1.2.3.4.", false},
      {"a.b.c.d", false},
      {"", false},
      {"/24", false},
      {"1.2.3.4 ", false},
      {" 1.2.3.4", false},
      {"1.2.3.4\n", false},
      {"1.2.3.4/24\n", false},
      {"1.2.3.4/24 ", false},
      {std::string("1.2.3.4\0", 8), false},
  };
  for (int octet = 0; octet <= 999; ++octet) {
    const std::string text = std::to_string(octet);
    const bool valid = octet <= 255;
    cases.push_back({text + ".1.1.1", valid});
    cases.push_back({"1.1.1." + text, valid});
    cases.push_back({"1." + text + ".1.1", valid});
  }
  for (const char* padded : {"00", "000", "007", "010", "0255", "099"}) {
    cases.push_back({std::string("1.1.1.") + padded, false});
  }
  for (int prefix = 0; prefix <= 40; ++prefix) {
    cases.push_back({"10.1.2.3/" + std::to_string(prefix), prefix <= 32});
  }
  for (const char* prefix : {"00", "07", "032", "320", "3 2", "x"}) {
    cases.push_back({std::string("10.1.2.3/") + prefix, false});
  }
  return cases;
}

TEST(IsCIDRValid, IPv4AddressesAndPrefixes) {
  for (const Case& c : IPv4Cases()) {
    SCOPED_TRACE(Printable(c.text));
    EXPECT_EQ(c.valid, Validator::IsCIDRValid(c.text));
  }
}

TEST(IsCIDRValid, NamedIPv6Cases) {
  const std::vector<Case> cases = {
      {"FE80::1/64", true},
      {"fe80::1/64", true},
      {"::ffff:1.2.3.4", true},
      {"::FFFF:1.2.3.4", true},
      {"::", true},
      {"::/0", true},
      {"::1", true},
      {"::1/128", true},
      {"::1/129", false},
      {"::1/", false},
      {"2001:DB8:0:0:0:0:0:1", true},
      {"fe80::1%eth0", false},
      {"fe80::1%1", false},
      {"fe80::1%eth0/64", false},
      {"::1 ", false},
      {"::1\n", false},
      {" ::1", false},
      {"[::1]", false},
      {"::ffff:256.1.1.1", false},
      {"::ffff:01.2.3.4", false},
      {"1:2:3:4:5:6:1.2.3.4", true},
      {"1:2:3:4:5:6:7:1.2.3.4", false},
      {"1:2:3:4:5:6::1.2.3.4", false},
      {"::1.2.3.4:1", false},
      {"1:::2", false},
      {"1::2::3", false},
      {":1::2", false},
      {"1::2:", false},
      {"12345::", false},
      {"g::", false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(Printable(c.text));
    EXPECT_EQ(c.valid, Validator::IsCIDRValid(c.text));
  }
}

// Ten labels whose ASCII form is "xn--bcher-kva" (14 bytes with its dot).
std::string TenUmlautLabels() { return Repeat(std::string("b") + kUmlaut + "cher.", 10); }
// Labels of 63 bytes once converted: "xn--" + 55 "a" + "-8yf"; one more "a" gives 64.
std::string UmlautLabel(int letters) { return std::string(letters, 'a') + kUmlaut; }

TEST(IsSerNameValid, LabelsLengthsAndConversion) {
  // ASCII forms: 140 + 63 + 1 + 49 = 253 bytes, then 254.
  const std::string name253 = TenUmlautLabels() + std::string(63, 'a') + "." + std::string(49, 'a');
  const std::string name254 = name253 + "a";
  const std::vector<Case> cases = {
      {"nas", true},
      {"NAS", true},
      {"portal.box1", true},
      {"portal.box1.", true},
      {"portal.box1..", false},
      {"a", true},
      {"1.2.3.4", true},
      {"a-b.c-d", true},
      {"", false},
      {".", false},
      {"-a.b", false},
      {"a-.b", false},
      {"a.-b", false},
      {"a..b", false},
      {".a", false},
      {"my_nas", false},
      {"my nas", false},
      {"nas ", false},
      {"nas\n", false},
      {"ab--cd", false},          // hyphens in the third and fourth place
      {"xn--abc", false},         // not decodable
      {"xn--bcher-kva.example", true},
      {std::string("b") + kUmlaut + "cher.example", true},
      {"Stra\xc3\x9f" "e.de", true},  // transitional mapping to "strasse"
      {std::string(kEuro), true},
      {"\xff.example", false},    // not UTF-8
      {std::string(63, 'a'), true},
      {std::string(64, 'a'), false},
      {std::string(63, 'a') + ".b", true},
      {"b." + std::string(64, 'a'), false},
      {UmlautLabel(55), true},
      {UmlautLabel(56), false},
      {UmlautLabel(55) + ".example.", true},
      {name253, true},
      {name254, false},
      {name253 + ".", true},
      {name254 + ".", false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(Printable(c.text));
    EXPECT_EQ(c.valid, Validator::IsSerNameValid(c.text));
  }
}

TEST(UTF8ToPunycode, AppendsTheAsciiFormOrLeavesTheOutput) {
  const std::string name253 = TenUmlautLabels() + std::string(63, 'a') + "." + std::string(49, 'a');
  struct Conversion {
    std::string in;
    bool ok;
    std::string ascii;
  };
  const std::vector<Conversion> conversions = {
      {"nas", true, "nas"},
      {"NAS.Example", true, "nas.example"},
      {std::string("b") + kUmlaut + "cher", true, "xn--bcher-kva"},
      {"m" + std::string(kUmlaut) + "nchen.de", true, "xn--mnchen-3ya.de"},
      {"\xe6\x97\xa5\xe6\x9c\xac.jp", true, "xn--wgv71a.jp"},
      {"Stra\xc3\x9f" "e", true, "strasse"},
      {"my_nas", true, "my_nas"},  // the conversion keeps what the pattern refuses
      {UmlautLabel(55), true, "xn--" + std::string(55, 'a') + "-8yf"},
      {UmlautLabel(56), false, ""},
      {name253, true, Repeat("xn--bcher-kva.", 10) + std::string(63, 'a') + "." + std::string(49, 'a')},
      {name253 + "a", false, ""},
      {"", false, ""},
      {"a..b", false, ""},
      {"-a", false, ""},
      {"\xc3", false, ""},
  };
  for (const Conversion& c : conversions) {
    SCOPED_TRACE(Printable(c.in));
    std::string out = "kept:";
    EXPECT_EQ(c.ok, Validator::UTF8ToPunycode(c.in, out));
    EXPECT_EQ("kept:" + c.ascii, out);
  }
}

}  // namespace
}  // namespace tavow3
