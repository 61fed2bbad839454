#include "portal/portal_files.h"

#include <dirent.h>
#include <ftw.h>
#include <unistd.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <sstream>

#include "support/syslog_capture.h"

namespace tavow3::test {

void MakeDirs(const std::string& dir) {
  for (size_t slash = 1; slash != std::string::npos; slash = dir.find('/', slash + 1)) {
    const std::string prefix = dir.substr(0, slash);
    if (::mkdir(prefix.c_str(), 0755) != 0 && errno != EEXIST) {
      ADD_FAILURE() << "mkdir " << prefix << ": " << std::strerror(errno);
    }
  }
  if (::mkdir(dir.c_str(), 0755) != 0 && errno != EEXIST) {
    ADD_FAILURE() << "mkdir " << dir << ": " << std::strerror(errno);
  }
}

void RemoveTree(const std::string& path) {
  auto remove = [](const char* name, const struct stat*, int, struct FTW*) { return ::remove(name); };
  if (::nftw(path.c_str(), remove, 16, FTW_DEPTH | FTW_PHYS) != 0 && errno != ENOENT) {
    ADD_FAILURE() << "cannot remove " << path << ": " << std::strerror(errno);
  }
}

void WriteFileBytes(const std::string& path, const std::string& bytes) {
  MakeDirs(path.substr(0, path.rfind('/')));
  std::ofstream out(path, std::ios::binary | std::ios::trunc);
  out << bytes;
  out.close();
  if (!out) ADD_FAILURE() << "cannot write " << path;
}

std::string ReadFileBytes(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) return "<missing>";
  std::ostringstream bytes;
  bytes << in.rdbuf();
  return bytes.str();
}

bool StatPath(const std::string& path, struct stat* st) { return ::stat(path.c_str(), st) == 0; }

std::vector<std::string> DirNames(const std::string& dir) {
  std::vector<std::string> names;
  DIR* handle = ::opendir(dir.c_str());
  if (handle == nullptr) return names;
  while (dirent* entry = ::readdir(handle)) {
    const std::string name = entry->d_name;
    if (name != "." && name != "..") names.push_back(name);
  }
  ::closedir(handle);
  std::sort(names.begin(), names.end());
  return names;
}

std::vector<std::string> TaggedLogLines(const std::string& tag) {
  std::vector<std::string> lines;
  for (const std::string& line : LogMessages()) {
    if (line.compare(0, tag.size() + 1, tag + ":") == 0) lines.push_back(line);
  }
  return lines;
}

}  // namespace tavow3::test
