#include "support/test_files.h"

#include <dirent.h>
#include <fcntl.h>
#include <ftw.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>
#include <sstream>

#include <gtest/gtest.h>
#include <json/reader.h>

namespace tavow3::test {
namespace {

bool WriteAllTo(int fd, const std::string& bytes) {
  size_t done = 0;
  while (done < bytes.size()) {
    const ssize_t n = ::write(fd, bytes.data() + done, bytes.size() - done);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) return false;
    done += static_cast<size_t>(n);
  }
  return true;
}

}  // namespace

void WriteBytes(const std::string& path, const std::string& bytes) {
  const size_t slash = path.rfind('/');
  if (slash != std::string::npos && slash > 0) MakeDirs(path.substr(0, slash));
  const int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
  const bool created = fd >= 0;
  const int file = created ? fd : ::open(path.c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC);
  if (file < 0) {
    ADD_FAILURE() << "cannot open " << path << ": " << std::strerror(errno);
    return;
  }
  // The mode of a new file must not depend on the umask.
  const bool written = (!created || ::fchmod(file, 0644) == 0) && WriteAllTo(file, bytes);
  const int error = errno;
  if (::close(file) != 0 || !written) {
    ADD_FAILURE() << "cannot write " << path << ": " << std::strerror(written ? errno : error);
  }
}

void WriteBytes(const std::string& path, const std::string& bytes, mode_t mode) {
  WriteBytes(path, bytes);
  if (::chmod(path.c_str(), mode) != 0) {
    ADD_FAILURE() << "cannot chmod " << path << ": " << std::strerror(errno);
  }
}

std::string ReadBytes(const std::string& path) {
  const int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) return "<missing>";
  std::string text;
  char buffer[4096];
  ssize_t n;
  while ((n = ::read(fd, buffer, sizeof buffer)) > 0 || (n < 0 && errno == EINTR)) {
    if (n > 0) text.append(buffer, static_cast<size_t>(n));
  }
  ::close(fd);
  return text;  // a directory opens but reads nothing
}

bool PathExists(const std::string& path) {
  struct stat st;
  return ::lstat(path.c_str(), &st) == 0;
}

bool IsDirectory(const std::string& path) {
  struct stat st;
  return ::lstat(path.c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

std::string LinkTarget(const std::string& path) {
  char buffer[4096];
  const ssize_t n = ::readlink(path.c_str(), buffer, sizeof buffer);
  return n < 0 ? std::string() : std::string(buffer, static_cast<size_t>(n));
}

ino_t InodeOf(const std::string& path) {
  struct stat st;
  return ::lstat(path.c_str(), &st) == 0 ? st.st_ino : 0;
}

ino_t InodeOf(int fd) {
  struct stat st;
  return ::fstat(fd, &st) == 0 ? st.st_ino : 0;
}

mode_t ModeOf(const std::string& path) {
  struct stat st;
  return ::lstat(path.c_str(), &st) == 0 ? st.st_mode & 07777 : 0;
}

void MakeDirs(const std::string& dir) {
  for (size_t slash = dir.find('/', 1);; slash = dir.find('/', slash + 1)) {
    const std::string prefix = dir.substr(0, slash);
    if (::mkdir(prefix.c_str(), 0755) != 0 && errno != EEXIST) {
      ADD_FAILURE() << "mkdir " << prefix << ": " << std::strerror(errno);
      return;
    }
    if (slash == std::string::npos) return;
  }
}

void RemoveTree(const std::string& path) {
  auto remove = [](const char* name, const struct stat*, int, struct FTW*) {
    return ::remove(name);
  };
  if (::nftw(path.c_str(), remove, 16, FTW_DEPTH | FTW_PHYS) != 0 && errno != ENOENT) {
    ADD_FAILURE() << "cannot remove " << path << ": " << std::strerror(errno);
  }
}

std::string FreshDir(const std::string& path) {
  RemoveTree(path);
  MakeDirs(path);
  return path;
}

std::vector<std::string> DirNames(const std::string& dir) {
  std::vector<std::string> names;
  DIR* handle = ::opendir(dir.c_str());
  if (handle == nullptr) return names;
  while (const dirent* entry = ::readdir(handle)) {
    const std::string name = entry->d_name;
    if (name != "." && name != "..") names.push_back(name);
  }
  ::closedir(handle);
  std::sort(names.begin(), names.end());
  return names;
}

std::vector<std::string> Lines(const std::string& text) {
  std::vector<std::string> lines;
  std::istringstream in(text);
  for (std::string line; std::getline(in, line);) lines.push_back(line);
  return lines;
}

Json::Value ParseJson(const std::string& text) {
  Json::Value value;
  std::string errors;
  const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
  if (!reader->parse(text.data(), text.data() + text.size(), &value, &errors)) {
    ADD_FAILURE() << "malformed JSON (" << errors << "): " << text;
    return Json::Value();
  }
  return value;
}

Json::Value ReadJson(const std::string& path) { return ParseJson(ReadBytes(path)); }

}  // namespace tavow3::test
