// POSIX shared memory objects and their mappings.
#ifndef TAVOW3_SRC_BASE_SHARED_MEMORY_H_
#define TAVOW3_SRC_BASE_SHARED_MEMORY_H_

#include <sys/types.h>

#include <cstddef>
#include <string>

#include "base/export.h"
#include "base/unique_fd.h"

namespace tavow3::base {

// shm_open(3) of `name` ("nginx_mod": no leading slash needed).
TAVOW3_INTERNAL UniqueFd ShmOpen(const std::string& name, int flags, mode_t mode);
TAVOW3_INTERNAL bool ShmUnlink(const std::string& name);
// ftruncate(2).
TAVOW3_INTERNAL bool Truncate(int fd, off_t size);

// An mmap(2) of `size` bytes of `fd` from offset 0, unmapped on destruction.
class TAVOW3_INTERNAL Mapping {
 public:
  Mapping() = default;
  Mapping(int fd, size_t size, int protection, int flags);
  Mapping(Mapping&& other) noexcept;
  Mapping& operator=(Mapping&& other) noexcept;
  ~Mapping();
  Mapping(const Mapping&) = delete;
  Mapping& operator=(const Mapping&) = delete;

  bool valid() const { return data_ != nullptr; }
  explicit operator bool() const { return valid(); }
  char* data() const { return data_; }
  size_t size() const { return size_; }

 private:
  char* data_ = nullptr;
  size_t size_ = 0;
};

}  // namespace tavow3::base

#endif  // TAVOW3_SRC_BASE_SHARED_MEMORY_H_
