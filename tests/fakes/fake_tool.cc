// A fake of one of the appliance's own tools, named by its file name. Each run
// appends its arguments (argv[0] left out) as one compact JSON array line to
// /run/tavow3-fakes/<name>.jsonl, then exits with the integer found in
// /run/tavow3-fakes/<name>.rc, or 0 when that file is missing.
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>
#include <string>

#include <json/json.h>

namespace {

constexpr char kDir[] = "/run/tavow3-fakes";
constexpr int kBroken = 125;  // the fake itself could not do its job

// The name comes from the executable itself: callers may pass any argv[0].
std::string ToolName(const char* argv0) {
  char path[PATH_MAX];
  ssize_t n = ::readlink("/proc/self/exe", path, sizeof path - 1);
  std::string name = n > 0 ? std::string(path, static_cast<size_t>(n)) : std::string(argv0);
  return name.substr(name.find_last_of('/') + 1);
}

std::string ArgsLine(int argc, char** argv) {
  Json::Value args(Json::arrayValue);
  for (int i = 1; i < argc; ++i) args.append(argv[i]);
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  builder["emitUTF8"] = true;  // argument bytes pass through unchanged
  return Json::writeString(builder, args) + "\n";
}

bool Append(const std::string& path, const std::string& line) {
  int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0644);
  if (fd < 0) return false;
  // One write with O_APPEND: concurrent runs never interleave inside a line.
  ssize_t n;
  do {
    n = ::write(fd, line.data(), line.size());
  } while (n < 0 && errno == EINTR);
  bool ok = n == static_cast<ssize_t>(line.size());
  return ::close(fd) == 0 && ok;
}

// Returns the status to exit with, or kBroken when the .rc file is unreadable.
int ExitStatus(const std::string& path) {
  std::ifstream in(path);
  if (!in) return errno == ENOENT ? 0 : kBroken;
  std::string text((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  char* end = nullptr;
  long status = std::strtol(text.c_str(), &end, 10);
  while (*end == '\n' || *end == ' ') ++end;
  if (end == text.c_str() || *end != '\0' || status < 0 || status > 255) {
    std::fprintf(stderr, "fake tool: bad exit status in %s: \"%s\"\n", path.c_str(), text.c_str());
    return kBroken;
  }
  return static_cast<int>(status);
}

}  // namespace

int main(int argc, char** argv) {
  std::string name = ToolName(argv[0]);
  std::string base = std::string(kDir) + "/" + name;
  if (::mkdir(kDir, 0755) != 0 && errno != EEXIST) {
    std::fprintf(stderr, "%s (fake): mkdir %s: %s\n", name.c_str(), kDir, std::strerror(errno));
    return kBroken;
  }
  if (!Append(base + ".jsonl", ArgsLine(argc, argv))) {
    std::fprintf(stderr, "%s (fake): cannot record the call: %s\n", name.c_str(),
                 std::strerror(errno));
    return kBroken;
  }
  return ExitStatus(base + ".rc");
}
