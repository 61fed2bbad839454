// Every textual IPv6 form, generated, and checked against the C library's parser.
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <tavow3/validator.h>

#include <random>
#include <string>
#include <vector>

namespace tavow3 {
namespace {

// Group texts taken in rotation: one to four digits, zeros, both cases.
const std::vector<std::string> kGroups = {"1", "ab", "0", "ffff", "FFFF", "0db8", "Fe80", "c0A", "00"};
const std::vector<std::string> kIPv4 = {"1.2.3.4", "0.0.0.0", "255.255.255.255", "192.168.10.99"};

std::string Groups(int first, int count) {
  std::string text;
  for (int i = 0; i < count; ++i) {
    if (i > 0) text += ":";
    text += kGroups[(first + i) % kGroups.size()];
  }
  return text;
}

// `before` groups, "::", `after` groups.
std::string Compressed(int before, int after, int rotation) {
  return Groups(rotation, before) + "::" + Groups(rotation + before, after);
}

// `before` groups, "::", `after` groups, then an IPv4 address for the last two.
std::string CompressedWithIPv4(int before, int after, int rotation) {
  std::string text = Compressed(before, after, rotation);
  if (after > 0) text += ":";
  return text + kIPv4[rotation % kIPv4.size()];
}

// Every form RFC 4291 allows: "::" at each place among 0 to 7 written groups,
// the full eight groups, and the same with an IPv4 tail (0 to 5 groups around
// "::", or six in full).
std::vector<std::string> AcceptedForms() {
  std::vector<std::string> forms;
  for (int rotation = 0; rotation < static_cast<int>(kGroups.size()); ++rotation) {
    for (int written = 0; written <= 7; ++written) {
      for (int before = 0; before <= written; ++before) {
        forms.push_back(Compressed(before, written - before, rotation));
      }
    }
    forms.push_back(Groups(rotation, 8));
    for (int written = 0; written <= 5; ++written) {
      for (int before = 0; before <= written; ++before) {
        forms.push_back(CompressedWithIPv4(before, written - before, rotation));
      }
    }
    forms.push_back(Groups(rotation, 6) + ":" + kIPv4[rotation % kIPv4.size()]);
  }
  return forms;
}

// Too many or too few groups, two compressions, stray colons.
std::vector<std::string> RefusedForms() {
  std::vector<std::string> forms;
  for (int rotation = 0; rotation < static_cast<int>(kGroups.size()); ++rotation) {
    for (int before = 0; before <= 8; ++before) forms.push_back(Compressed(before, 8 - before, rotation));
    for (int before = 0; before <= 6; ++before) {
      forms.push_back(CompressedWithIPv4(before, 6 - before, rotation));
    }
    for (int count : {1, 2, 7, 9}) forms.push_back(Groups(rotation, count));
    forms.push_back(Groups(rotation, 7) + ":" + kIPv4[0]);
    forms.push_back(Groups(rotation, 5) + ":" + kIPv4[0]);
    forms.push_back(Groups(rotation, 2) + "::" + Groups(rotation, 1) + "::" + Groups(rotation, 1));
    forms.push_back(":" + Groups(rotation, 7));
    forms.push_back(Groups(rotation, 7) + ":");
    forms.push_back(":" + Compressed(1, 1, rotation));
    forms.push_back(Compressed(1, 1, rotation) + ":");
    forms.push_back(Groups(rotation, 3) + ":::" + Groups(rotation, 2));
    forms.push_back("::" + kIPv4[0] + ":1");
  }
  return forms;
}

bool InetPton6(const std::string& text) {
  unsigned char address[16];
  return inet_pton(AF_INET6, text.c_str(), address) == 1;
}

TEST(IsCIDRValidIPv6, EveryTextualFormIsAccepted) {
  const std::vector<std::string> forms = AcceptedForms();
  ASSERT_EQ(9u * (36 + 1 + 21 + 1), forms.size());
  for (const std::string& form : forms) {
    SCOPED_TRACE(form);
    ASSERT_TRUE(InetPton6(form)) << "generator error";
    EXPECT_TRUE(Validator::IsCIDRValid(form));
  }
}

TEST(IsCIDRValidIPv6, MalformedFormsAreRefused) {
  for (const std::string& form : RefusedForms()) {
    SCOPED_TRACE(form);
    ASSERT_FALSE(InetPton6(form)) << "generator error";
    EXPECT_FALSE(Validator::IsCIDRValid(form));
  }
}

TEST(IsCIDRValidIPv6, PrefixLengthBounds) {
  const std::vector<std::pair<std::string, bool>> prefixes = {
      {"/0", true},     {"/9", true},     {"/10", true},    {"/64", true},   {"/99", true},
      {"/100", true},   {"/119", true},   {"/120", true},   {"/128", true},  {"/129", false},
      {"/130", false},  {"/200", false},  {"/1280", false}, {"/01", false},  {"/00", false},
      {"/", false},     {"/-1", false},   {"//64", false},  {"/64/64", false}, {"/6 4", false},
  };
  for (const std::string& form : AcceptedForms()) {
    for (const auto& [prefix, valid] : prefixes) {
      SCOPED_TRACE(form + prefix);
      EXPECT_EQ(valid, Validator::IsCIDRValid(form + prefix));
    }
  }
}

// The whole text must match: nothing may precede or follow, not even a zone.
TEST(IsCIDRValidIPv6, NothingAroundTheAddress) {
  for (const std::string& form : AcceptedForms()) {
    for (const std::string& text : {form + "%eth0", form + "%1", form + " ", form + "\n",
                                    " " + form, "\n" + form, form + "/64\n", "[" + form + "]",
                                    form + "/64%eth0", form + std::string(1, '\0')}) {
      SCOPED_TRACE(testing::PrintToString(text));
      EXPECT_FALSE(Validator::IsCIDRValid(text));
    }
  }
}

// A group of five digits or a non-hex letter anywhere spoils the address.
TEST(IsCIDRValidIPv6, EveryGroupPositionIsChecked) {
  for (int position = 0; position < 8; ++position) {
    for (const std::string& bad : {std::string("12345"), std::string("fffg"), std::string("1.2")}) {
      std::string text;
      for (int i = 0; i < 8; ++i) {
        if (i > 0) text += ":";
        text += i == position ? bad : "abcd";
      }
      SCOPED_TRACE(text);
      EXPECT_FALSE(Validator::IsCIDRValid(text));
    }
  }
}

// Random addresses in random forms, then up to three random edits. The C
// library's parser refuses leading zeros in the IPv4 tail too, so both must
// agree on every string (an IPv4 address alone is asked of AF_INET).
TEST(IsCIDRValidIPv6, AgreesWithInetPtonOnMutatedStrings) {
  std::mt19937 random(20240601);
  const std::string digits = "0123456789abcdefABCDEF";
  const std::string edits = "0123456789abcdefABCDEF::..::g% ";
  auto pick = [&](const std::string& from) { return from[random() % from.size()]; };
  int accepted = 0;
  int refused = 0;
  for (int round = 0; round < 20000; ++round) {
    std::vector<std::string> groups(random() % 9);
    for (std::string& group : groups) {
      group.resize(1 + random() % 4);
      for (char& c : group) c = pick(digits);
    }
    std::string text;
    const size_t gap = random() % 4 == 0 ? groups.size() + 1 : random() % (groups.size() + 1);
    for (size_t i = 0; i <= groups.size(); ++i) {
      if (i == gap) text += "::";
      else if (i > 0 && i < groups.size()) text += ":";
      if (i < groups.size()) text += groups[i];
    }
    if (random() % 3 == 0) {
      if (!text.empty() && text.back() != ':') text += ":";
      text += std::to_string(random() % 300) + "." + std::to_string(random() % 256) + "." +
              std::to_string(random() % 256) + "." + std::to_string(random() % 260);
    }
    for (int edit = random() % 4; edit > 0 && !text.empty(); --edit) {
      const size_t at = random() % text.size();
      switch (random() % 3) {
        case 0: text.insert(at, 1, pick(edits)); break;
        case 1: text.erase(at, 1); break;
        default: text[at] = pick(edits); break;
      }
    }
    unsigned char address[16];
    const bool expected =
        InetPton6(text) || inet_pton(AF_INET, text.c_str(), address) == 1;
    const bool actual = Validator::IsCIDRValid(text);
    EXPECT_EQ(expected, actual) << testing::PrintToString(text);
    ++(actual ? accepted : refused);
  }
  // Both answers must be common, or the comparison proves little.
  EXPECT_GT(accepted, 3000);
  EXPECT_GT(refused, 3000);
}

}  // namespace
}  // namespace tavow3
