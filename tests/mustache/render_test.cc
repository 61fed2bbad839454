// tavomustache's renderer: JSON values as mustache data and the escapings.
#include <json/value.h>

#include <string>

#include <gtest/gtest.h>

#include "render.h"
#include "support/test_files.h"

namespace tavomustache {
namespace {

using tavow3::test::ParseJson;

struct Case {
  const char* name;
  const char* tmpl;
  const char* json;
  Escape escape;
  const char* output;
};

TEST(MustacheRender, JsonValuesAndEscapings) {
  const Case cases[] = {
      {"sc escaping", R"(v="{{v}}")", R"({"v":"say \"hi\" C:\\x"})", Escape::kServiceConf,
       R"(v="say \"hi\" C:\\x")"},
      {"triple mustache is raw", R"({{{v}}}|{{&v}})", R"({"v":"a\"b<"})", Escape::kServiceConf,
       R"(a"b<|a"b<)"},
      {"html escaping", "{{v}}", R"({"v":"<a href=\"x\">&"})", Escape::kHtml,
       "&lt;a href=&quot;x&quot;&gt;&amp;"},
      {"no escaping", "{{v}}", R"({"v":"<\"\\"})", Escape::kNone, R"(<"\)"},
      {"utf-8 passes", "{{v}}", R"({"v":"Zürich 東京"})", Escape::kServiceConf, "Zürich 東京"},
      {"numbers", "{{i}} {{n}} {{u}} {{d}} {{e}}",
       R"({"i":443,"n":-7,"u":18446744073709551615,"d":0.1,"e":1e20})", Escape::kServiceConf,
       "443 -7 18446744073709551615 0.1 1e+20"},
      {"arrays", "{{#a}}[{{name}}]{{/a}}{{^e}}empty{{/e}}",
       R"({"a":[{"name":"x"},{"name":"y"}],"e":[]})", Escape::kServiceConf, "[x][y]empty"},
      {"array of scalars", "{{#a}}{{.}},{{/a}}", R"({"a":[1,"two",3.5]})", Escape::kServiceConf,
       "1,two,3.5,"},
      {"nested and dotted names", "{{#o}}{{p.q}}{{top}}{{/o}}|{{o.p.q}}",
       R"({"top":"T","o":{"p":{"q":"Q"}}})", Escape::kServiceConf, "QT|Q"},
      {"booleans and null", "{{#t}}T{{/t}}{{#f}}F{{/f}}{{^f}}!F{{/f}}{{#n}}N{{/n}}{{^n}}!N{{/n}}[{{t}}{{n}}]",
       R"({"t":true,"f":false,"n":null})", Escape::kServiceConf, "T!F!N[]"},
      {"missing keys", "[{{missing}}][{{#missing}}x{{/missing}}][{{^missing}}y{{/missing}}]",
       R"({})", Escape::kServiceConf, "[][][y]"},
      {"standalone section lines", "a\n{{#s}}\nb\n{{/s}}\nc\n", R"({"s":true})",
       Escape::kServiceConf, "a\nb\nc\n"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    std::string output, error;
    ASSERT_TRUE(Render(c.tmpl, ParseJson(c.json), c.escape, &output, &error)) << error;
    EXPECT_EQ(c.output, output);
  }
}

TEST(MustacheRender, RefusesWhatItCannotRenderCorrectly) {
  const struct {
    const char* name;
    const char* tmpl;
    const char* json;
    Escape escape;
    const char* error;
  } cases[] = {
      {"line break in a quoted value", R"(v="{{v}}")", R"({"v":"a\nb"})", Escape::kServiceConf,
       R"(value "a\nb" holds a control character, which a quoted value cannot carry)"},
      {"tab in a quoted value", "{{v}}", R"({"v":"a\tb"})", Escape::kServiceConf,
       R"(value "a\tb" holds a control character, which a quoted value cannot carry)"},
      {"escape in a quoted value", "{{v}}", R"({"v":"\u001b[0m"})", Escape::kServiceConf,
       R"(value "\x1b[0m" holds a control character, which a quoted value cannot carry)"},
      {"unclosed section", "{{#a}}x", R"({"a":true})", Escape::kServiceConf,
       "invalid template: Unclosed section \"a\" at 0"},
      {"partial", "{{>p}}", R"({"p":"{{x}}"})", Escape::kNone,
       "partial \"p\" is not supported"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    std::string output, error;
    EXPECT_FALSE(Render(c.tmpl, ParseJson(c.json), c.escape, &output, &error));
    EXPECT_EQ(c.error, error);
  }
  std::string output, error;
  EXPECT_TRUE(Render("{{{v}}}", ParseJson(R"({"v":"a\nb"})"), Escape::kServiceConf, &output, &error))
      << "raw values are the template's business";
}

TEST(MustacheRender, EscapeNames) {
  Escape escape = Escape::kNone;
  EXPECT_TRUE(ParseEscape("sc", &escape));
  EXPECT_EQ(Escape::kServiceConf, escape);
  EXPECT_TRUE(ParseEscape("html", &escape));
  EXPECT_EQ(Escape::kHtml, escape);
  EXPECT_FALSE(ParseEscape("SC", &escape));
  EXPECT_EQ(Escape::kHtml, escape);
}

}  // namespace
}  // namespace tavomustache
