// tavow3-nginxconf run as a program: its output, error output and exit status.
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "manager_fixtures.h"
#include "support/syslog_capture.h"
#include "support/test_process.h"

namespace tavow3::test {
namespace {

struct CliCase {
  std::vector<std::string> args;
  int status;
  const char* out;
  const char* err_part;  // a part of the error output; "" wants it empty
};

TEST(Tavow3Nginxconf, PrintsTheMessageAndExitsWithTheResult) {
  const std::vector<CliCase> cases = {
      {{"7"}, 0, "Nginx is not forced to default mode\n", ""},
      {{"5"}, 255, "Failed to get nginx mode\n", ""},
      {{"1"}, 255, "", ""},  // nginx does not run
      {{"8", "192.0.2.1", "fd00::1"}, 0, "List of Vantoro servers is set.\n", ""},
      {{"10"}, 0, "192.0.2.1\nfd00::1\n", ""},
      {{"8", "192.0.2.2", "bad", "worse"}, 255, "bad is an invalid IP\n", ""},
      {{"10"}, 0, "192.0.2.1\nfd00::1\n", ""},
      {{"3", "extra"}, 255, "", ""},
      {{"9"}, 0, "Trust list of Vantoro servers is cleared.\n", ""},
      {{"10"}, 0, "", ""},
      {{"8"}, 0, "List of Vantoro servers is empty.\nClear the trust list.\n", ""},
      {{"6"}, 0, "", ""},
      {{"7"}, 1, "Nginx is forced to default mode\n", ""},
      {{"42"}, 255, "", ""},
      {{"-1"}, 255, "", ""},
      {{"-2147483648"}, 255, "", ""},
      {{}, 2, "", "usage: tavow3-nginxconf OP [ARG...]"},
      {{"abc"}, 2, "", "OP must be an integer, not \"abc\""},
      {{"5x"}, 2, "", "OP must be an integer"},
      {{""}, 2, "", "OP must be an integer"},
      {{"2147483648"}, 2, "", "OP must be an integer"},
      {{"--help", "5"}, 0, nullptr, ""},
  };
  for (const CliCase& c : cases) {
    std::string joined;
    for (const std::string& arg : c.args) joined += " [" + arg + "]";
    SCOPED_TRACE(joined);
    std::vector<std::string> argv = {kCli};
    argv.insert(argv.end(), c.args.begin(), c.args.end());
    const RunResult run = RunCommand(argv);
    EXPECT_EQ(c.status, run.status);
    if (c.out != nullptr) {
      EXPECT_EQ(c.out, run.out);
    }
    if (*c.err_part == '\0') {
      EXPECT_EQ("", run.err);
    } else {
      EXPECT_NE(std::string::npos, run.err.find(c.err_part)) << run.err;
    }
  }
}

TEST(Tavow3Nginxconf, HelpNamesEveryOperatorAndUnknownOnesAreLogged) {
  const RunResult help = RunCommand({kCli, "--help"});
  EXPECT_EQ(0, help.status);
  for (int op = 0; op <= 10; ++op) {
    const std::string number = (op < 10 ? "  " : " ") + std::to_string(op) + "  ";
    EXPECT_NE(std::string::npos, help.out.find("\n" + number)) << op << "\n" << help.out;
  }
  ClearLog();
  EXPECT_EQ(255, RunCommand({kCli, "11"}).status);
  EXPECT_EQ(std::vector<std::string>{"nginx_deploy:800 bad parrameter"},
            TaggedLogMessages("nginx_deploy"));
}

}  // namespace
}  // namespace tavow3::test
