#include "base/shared_memory.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cerrno>
#include <utility>

#include "base/fault.h"

namespace tavow3::base {
namespace {

std::string ObjectName(const std::string& name) {
  return !name.empty() && name[0] == '/' ? name : "/" + name;
}

// The only munmap(2). It fails only for arguments mmap(2) never returns.
void Unmap(char* data, size_t size) noexcept {
  if (data != nullptr) (void)::munmap(data, size);
}

}  // namespace

UniqueFd ShmOpen(const std::string& name, int flags, mode_t mode) {
  if (fault::Fire(fault::Op::kShmOpen)) return UniqueFd();
  int fd;
  do {
    fd = ::shm_open(ObjectName(name).c_str(), flags | O_CLOEXEC, mode);
  } while (fd < 0 && errno == EINTR);
  return UniqueFd(fd);
}

bool ShmUnlink(const std::string& name) {
  if (fault::Fire(fault::Op::kShmUnlink)) return false;
  return ::shm_unlink(ObjectName(name).c_str()) == 0;
}

bool Truncate(int fd, off_t size) {
  if (fault::Fire(fault::Op::kTruncate)) return false;
  int result;
  do {
    result = ::ftruncate(fd, size);
  } while (result != 0 && errno == EINTR);
  return result == 0;
}

Mapping::Mapping(int fd, size_t size, int protection, int flags) {
  if (fault::Fire(fault::Op::kMmap)) return;
  void* data = ::mmap(nullptr, size, protection, flags, fd, 0);
  if (data == MAP_FAILED) return;
  data_ = static_cast<char*>(data);
  size_ = size;
}

Mapping::Mapping(Mapping&& other) noexcept
    : data_(std::exchange(other.data_, nullptr)), size_(std::exchange(other.size_, 0)) {}

Mapping& Mapping::operator=(Mapping&& other) noexcept {
  if (this != &other) {
    Unmap(data_, size_);
    data_ = std::exchange(other.data_, nullptr);
    size_ = std::exchange(other.size_, 0);
  }
  return *this;
}

Mapping::~Mapping() { Unmap(data_, size_); }

}  // namespace tavow3::base
