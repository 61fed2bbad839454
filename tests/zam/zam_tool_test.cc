// tavow3-zam, the demo's management tool: arguments, refusals, exit status.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/test_files.h"
#include "support/test_process.h"
#include "zam/zam_fixtures.h"

namespace tavow3 {
namespace {

using test::RunCommand;

constexpr char kTool[] = "/usr/tavo/bin/tavow3-zam";

TEST(ZAMTool, ArgumentsAndRefusals) {
  struct Case {
    std::vector<std::string> args;
    int status;
    const char* output;  // expected in standard output or error
  };
  const Case cases[] = {
      {{}, 2, "usage: tavow3-zam"},
      {{"show", "extra"}, 2, "usage: tavow3-zam"},
      {{"set-https-port"}, 2, "usage: tavow3-zam"},
      {{"show"}, 0, "HTTPS port: 5001"},
      {{"set-https-port", "443"}, 1, "port 443 refused"},
      {{"set-http-port", "5001"}, 1, "port 5001 refused"},
      {{"set-https-port", "0"}, 1, "port 0 refused"},
      {{"set-https-port", "70000"}, 1, "port 70000 refused"},
      {{"set-https-port", "6001x"}, 1, "port 6001x refused"},
  };
  for (const Case& c : cases) {
    std::vector<std::string> argv = {kTool};
    argv.insert(argv.end(), c.args.begin(), c.args.end());
    SCOPED_TRACE(testing::Message() << "tavow3-zam with " << c.args.size() << " arguments"
                                    << (c.args.empty() ? "" : ", " + c.args.back()));
    const test::RunResult run = RunCommand(argv);
    EXPECT_EQ(c.status, run.status);
    EXPECT_NE(std::string::npos, (run.out + run.err).find(c.output)) << run.out << run.err;
  }
  // Nothing refused reached the settings file.
  EXPECT_EQ("<missing>", test::ReadBytes(test::kStored));
}

}  // namespace
}  // namespace tavow3
