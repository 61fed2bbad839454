#include "test_util.h"

#include <fcntl.h>
#include <sys/mount.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>
#include <thread>

namespace tavow3::test {

namespace fs = std::filesystem;

std::string FreshDir(const std::string& path) {
  fs::remove_all(path);
  fs::create_directories(path);
  return path;
}

std::string ReadBytes(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) return "<missing>";
  return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

void WriteBytes(const std::string& path, const std::string& bytes) {
  std::ofstream(path, std::ios::binary | std::ios::trunc) << bytes;
}

std::vector<std::string> Names(const std::string& dir) {
  std::vector<std::string> names;
  for (const auto& entry : fs::directory_iterator(dir)) {
    names.push_back(entry.path().filename().string());
  }
  std::sort(names.begin(), names.end());
  return names;
}

ScopedMount ScopedMount::Tmpfs(const std::string& dir, const std::string& options) {
  if (::mount("tmpfs", dir.c_str(), "tmpfs", 0, options.c_str()) != 0) return ScopedMount("");
  return ScopedMount(dir);
}

ScopedMount ScopedMount::ReadOnly(const std::string& dir) {
  if (::mount(dir.c_str(), dir.c_str(), nullptr, MS_BIND, nullptr) != 0) return ScopedMount("");
  if (::mount(nullptr, dir.c_str(), nullptr, MS_BIND | MS_REMOUNT | MS_RDONLY, nullptr) != 0) {
    const int error = errno;
    (void)::umount2(dir.c_str(), MNT_DETACH);
    errno = error;
    return ScopedMount("");
  }
  return ScopedMount(dir);
}

ScopedMount::~ScopedMount() {
  if (!dir_.empty()) (void)::umount2(dir_.c_str(), MNT_DETACH);
}

bool IsCloseOnExec(int fd) {
  const int flags = ::fcntl(fd, F_GETFD);
  return flags >= 0 && (flags & FD_CLOEXEC) != 0;
}

unsigned long InodeOf(int fd) {
  struct stat st;
  return ::fstat(fd, &st) == 0 ? static_cast<unsigned long>(st.st_ino) : 0;
}

void WaitUntilBlockedIn(int tid, const std::string& function) {
  const std::string wchan = "/proc/self/task/" + std::to_string(tid) + "/wchan";
  while (ReadBytes(wchan).find(function) == std::string::npos) std::this_thread::yield();
}

int OpenDescriptors() {
  return static_cast<int>(std::distance(fs::directory_iterator("/proc/self/fd"),
                                        fs::directory_iterator()));
}

bool ProcessExists(int pid) { return fs::exists("/proc/" + std::to_string(pid)); }

}  // namespace tavow3::test
