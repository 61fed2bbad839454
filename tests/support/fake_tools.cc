#include "support/fake_tools.h"

#include <errno.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <json/json.h>

// These helpers use the C library directly, not src/base: a test may arm the
// library's fault hooks and must still be able to read what the fakes saw.
namespace tavow3::test {
namespace {

constexpr char kDir[] = "/run/tavow3-fakes";

std::string PathOf(const std::string& tool, const char* suffix) {
  return std::string(kDir) + "/" + tool + suffix;
}

}  // namespace

std::vector<std::vector<std::string>> FakeCalls(const std::string& tool) {
  std::vector<std::vector<std::string>> calls;
  std::ifstream in(PathOf(tool, ".jsonl"));
  std::string line;
  Json::CharReaderBuilder builder;
  builder["failIfExtra"] = true;
  while (std::getline(in, line)) {
    Json::Value args;
    std::string errors;
    std::istringstream stream(line);
    if (!Json::parseFromStream(builder, stream, &args, &errors) || !args.isArray()) {
      ADD_FAILURE() << "bad line in " << PathOf(tool, ".jsonl") << ": " << line << " " << errors;
      continue;
    }
    std::vector<std::string> call;
    for (const Json::Value& arg : args) call.push_back(arg.asString());
    calls.push_back(std::move(call));
  }
  return calls;
}

void SetFakeExit(const std::string& tool, int status) {
  ASSERT_TRUE(::mkdir(kDir, 0755) == 0 || errno == EEXIST) << kDir;
  std::string path = PathOf(tool, ".rc");
  std::string temp = path + ".new";
  {
    std::ofstream out(temp, std::ios::trunc);
    out << status << "\n";
    ASSERT_TRUE(out.good()) << temp;
  }
  ASSERT_EQ(0, ::rename(temp.c_str(), path.c_str())) << path;
}

void ClearFakeCalls(const std::string& tool) {
  std::string path = PathOf(tool, ".jsonl");
  ASSERT_TRUE(::unlink(path.c_str()) == 0 || errno == ENOENT) << path;
}

}  // namespace tavow3::test
