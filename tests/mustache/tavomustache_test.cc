// The tavomustache program as the engine runs it: arguments, exit status,
// messages and the output file.
#include <sys/stat.h>

#include <atomic>
#include <cstdio>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>
#include <tavo/tlib_exec.h>

#include "support/test_files.h"

namespace {

using tavow3::test::DirNames;
using tavow3::test::MakeDirs;
using tavow3::test::PathExists;
using tavow3::test::ReadBytes;
using tavow3::test::WriteBytes;

constexpr char kTool[] = "/usr/tavo/bin/tavomustache";
constexpr char kIn[] = "/tmp/mustache-in";
constexpr char kOutDir[] = "/tmp/mustache-out";
constexpr char kOut[] = "/tmp/mustache-out/out.sc";

std::string Write(const std::string& name, const std::string& bytes) {
  const std::string path = std::string(kIn) + "/" + name;
  WriteBytes(path, bytes);
  return path;
}

// Runs the tool; returns its exit status and stores what it printed.
int RunTool(const std::vector<std::string>& args, std::string* printed) {
  std::vector<const char*> argv = {kTool};
  for (const std::string& arg : args) argv.push_back(arg.c_str());
  argv.push_back(nullptr);
  FILE* stream = TLIBCPopen(argv.data(), "rB");
  if (stream == nullptr) return -2;
  printed->clear();
  char buffer[4096];
  size_t n;
  while ((n = std::fread(buffer, 1, sizeof(buffer), stream)) > 0) printed->append(buffer, n);
  return TLIBCPclose(stream);
}

TEST(Tavomustache, RendersIntoAFreshFile) {
  MakeDirs(kOutDir);
  const std::string tmpl = Write("t.mustache", "{{#s}}[{{n}}] v=\"{{v}}\"\n{{/s}}");
  const std::string json = Write("d.json", R"({"s":[{"n":"a","v":"x\"y"},{"n":"b","v":"z"}]})");
  std::string printed;
  ASSERT_EQ(0, RunTool({tmpl, json, "-o", kOut}, &printed)) << printed;
  EXPECT_EQ("", printed);
  EXPECT_EQ("[a] v=\"x\\\"y\"\n[b] v=\"z\"\n", ReadBytes(kOut));
  struct stat st;
  ASSERT_EQ(0, ::stat(kOut, &st));
  EXPECT_EQ(0644u, st.st_mode & 07777);
  EXPECT_EQ(std::vector<std::string>{"out.sc"}, DirNames(kOutDir));

  ASSERT_EQ(0, RunTool({"-o", kOut, "--escape", "html", tmpl, json}, &printed)) << printed;
  EXPECT_EQ("[a] v=\"x&quot;y\"\n[b] v=\"z\"\n", ReadBytes(kOut)) << "options go anywhere";
}

TEST(Tavomustache, FailureLeavesTheOldOutput) {
  const std::string good_tmpl = Write("good.mustache", "{{v}}\n");
  const std::string good_json = Write("good.json", R"({"v":"new"})");
  const struct {
    const char* name;
    std::string tmpl, json;
    std::string message;
  } cases[] = {
      {"broken template", Write("bad.mustache", "{{#v}}\n"), good_json,
       "tavomustache: /tmp/mustache-in/bad.mustache: invalid template: Unclosed section \"v\" at 0\n"},
      {"missing template", "/tmp/mustache-in/none.mustache", good_json,
       "tavomustache: cannot open /tmp/mustache-in/none.mustache: No such file or directory\n"},
      {"malformed JSON", good_tmpl, Write("bad.json", "{\"v\":}"),
       "tavomustache: /tmp/mustache-in/bad.json: * Line 1, Column 6\n"
       "  Syntax error: value, object or array expected.\n\n"},
      {"JSON not an object", good_tmpl, Write("list.json", "[1]"),
       "tavomustache: /tmp/mustache-in/list.json: the document must be a JSON object\n"},
      {"value a quoted value cannot carry", good_tmpl, Write("nl.json", R"({"v":"a\nb"})"),
       "tavomustache: /tmp/mustache-in/good.mustache: value \"a\\nb\" holds a control character, "
       "which a quoted value cannot carry\n"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    MakeDirs(kOutDir);
    WriteBytes(kOut, "old");
    std::string printed;
    EXPECT_EQ(1, RunTool({c.tmpl, c.json, "-o", kOut}, &printed));
    EXPECT_EQ(c.message, printed);
    EXPECT_EQ("old", ReadBytes(kOut));
    EXPECT_EQ(std::vector<std::string>{"out.sc"}, DirNames(kOutDir)) << "no temporary left";
  }
}

TEST(Tavomustache, ReadersSeeTheOldOrTheNewOutputWhole) {
  MakeDirs(kOutDir);
  const size_t size = 1 << 20;
  const std::string tmpl = Write("t.mustache", "{{v}}");
  const std::string a = Write("a.json", "{\"v\":\"" + std::string(size, 'a') + "\"}");
  const std::string b = Write("b.json", "{\"v\":\"" + std::string(size, 'b') + "\"}");
  std::string printed;
  ASSERT_EQ(0, RunTool({tmpl, a, "-o", kOut}, &printed)) << printed;
  std::atomic<bool> done{false};
  int reads = 0, torn = 0;
  std::thread reader([&] {
    while (!done) {
      const std::string bytes = ReadBytes(kOut);
      ++reads;
      if (bytes != std::string(size, 'a') && bytes != std::string(size, 'b')) ++torn;
    }
  });
  for (int i = 0; i < 40; ++i) EXPECT_EQ(0, RunTool({tmpl, i % 2 ? a : b, "-o", kOut}, &printed));
  done = true;
  reader.join();
  EXPECT_GT(reads, 0);
  EXPECT_EQ(0, torn) << "of " << reads << " reads";
}

TEST(Tavomustache, OutputPathAndArgumentErrors) {
  const std::string tmpl = Write("t.mustache", "x");
  const std::string json = Write("d.json", "{}");
  std::string printed;
  EXPECT_EQ(1, RunTool({tmpl, json, "-o", "/tmp/no-such-dir/out"}, &printed));
  EXPECT_EQ("tavomustache: cannot create a temporary file for /tmp/no-such-dir/out: "
            "No such file or directory\n",
            printed);

  MakeDirs("/tmp/out-is-dir/out");
  EXPECT_EQ(1, RunTool({tmpl, json, "-o", "/tmp/out-is-dir/out"}, &printed));
  EXPECT_EQ(std::vector<std::string>{"out"}, DirNames("/tmp/out-is-dir")) << "no temporary left";

  const std::string usage = "usage: tavomustache [--escape sc|html|none] TEMPLATE JSON -o OUT\n";
  const struct {
    std::vector<std::string> args;
    std::string message;
  } wrong[] = {
      {{tmpl, json}, "TEMPLATE, JSON and -o OUT are required"},
      {{tmpl, json, "-o"}, "option -o needs a value"},
      {{tmpl, json, "extra", "-o", "/tmp/x"}, "unexpected argument extra"},
      {{"--escape", "xml", tmpl, json, "-o", "/tmp/x"}, "unknown escaping \"xml\""},
      {{"-x", tmpl, json, "-o", "/tmp/x"}, "unknown option -x"},
  };
  for (const auto& w : wrong) {
    SCOPED_TRACE(w.message);
    EXPECT_EQ(2, RunTool(w.args, &printed));
    EXPECT_EQ("tavomustache: " + w.message + "\n" + usage, printed);
  }
  EXPECT_FALSE(PathExists("/tmp/x"));
}

}  // namespace
