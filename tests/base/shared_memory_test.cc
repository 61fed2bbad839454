#include "base/shared_memory.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <string>

#include <gtest/gtest.h>

#include "base/child_process.h"
#include "base/fault.h"
#include "support/test_files.h"
#include "support/test_process.h"

namespace tavow3::base {
namespace {

constexpr char kName[] = "base_test_shm";
constexpr size_t kSize = 4096;

bool Mapped(const std::string& what) {
  return test::ReadBytes("/proc/self/maps").find(what) != std::string::npos;
}

TEST(SharedMemory, BytesCrossProcessesThroughTheObject) {
  (void)ShmUnlink(kName);
  UniqueFd fd = ShmOpen(kName, O_RDWR | O_CREAT | O_EXCL, 0600);
  ASSERT_TRUE(fd.valid()) << strerror(errno);
  EXPECT_TRUE(test::IsCloseOnExec(fd.get()));
  ASSERT_TRUE(Truncate(fd.get(), kSize));
  struct stat st;
  ASSERT_EQ(0, ::stat("/dev/shm/base_test_shm", &st));
  EXPECT_EQ(static_cast<off_t>(kSize), st.st_size);
  EXPECT_EQ(0600u, st.st_mode & 07777);

  Mapping mapping(fd.get(), kSize, PROT_READ | PROT_WRITE, MAP_SHARED);
  ASSERT_TRUE(mapping.valid()) << strerror(errno);
  EXPECT_EQ(kSize, mapping.size());
  std::memcpy(mapping.data(), "parent", 6);

  // A forked child opens the object by its slash name and writes at the end.
  const pid_t pid = Fork();
  if (pid == 0) {
    UniqueFd child_fd = ShmOpen("/base_test_shm", O_RDWR, 0);
    Mapping child_map(child_fd.get(), kSize, PROT_READ | PROT_WRITE, MAP_SHARED);
    const bool seen = child_map && std::memcmp(child_map.data(), "parent", 6) == 0;
    if (seen) std::memcpy(child_map.data() + kSize - 5, "child", 5);
    Exit(seen ? 0 : 1);
  }
  ASSERT_GT(pid, 0);
  ChildProcess child(pid);
  EXPECT_EQ(0, child.Wait());
  EXPECT_EQ("child", std::string(mapping.data() + kSize - 5, 5));

  EXPECT_TRUE(ShmUnlink(kName));
  errno = 0;
  EXPECT_FALSE(ShmUnlink(kName));
  EXPECT_EQ(ENOENT, errno);
  errno = 0;
  EXPECT_FALSE(ShmOpen(kName, O_RDWR, 0).valid());
  EXPECT_EQ(ENOENT, errno);
}

TEST(SharedMemory, MappingIsUnmappedOnceByItsLastOwner) {
  (void)ShmUnlink(kName);
  UniqueFd fd = ShmOpen(kName, O_RDWR | O_CREAT, 0600);
  ASSERT_TRUE(fd.valid());
  ASSERT_TRUE(Truncate(fd.get(), kSize));
  {
    Mapping first(fd.get(), kSize, PROT_READ, MAP_SHARED);
    ASSERT_TRUE(first.valid());
    char* const data = first.data();
    Mapping second(std::move(first));
    EXPECT_FALSE(first.valid());
    EXPECT_EQ(data, second.data());
    Mapping third;
    third = std::move(second);
    EXPECT_FALSE(second.valid());
    EXPECT_EQ(kSize, third.size());
    EXPECT_TRUE(Mapped("/dev/shm/base_test_shm"));
    third = Mapping();  // the old mapping goes at the assignment
    EXPECT_FALSE(Mapped("/dev/shm/base_test_shm"));
    third = Mapping(fd.get(), kSize, PROT_READ, MAP_SHARED);
    EXPECT_TRUE(Mapped("/dev/shm/base_test_shm"));
  }
  EXPECT_FALSE(Mapped("/dev/shm/base_test_shm"));
  EXPECT_TRUE(ShmUnlink(kName));
}

TEST(SharedMemory, FailuresSetErrno) {
  (void)ShmUnlink(kName);
  UniqueFd fd = ShmOpen(kName, O_RDWR | O_CREAT, 0600);
  ASSERT_TRUE(fd.valid());
  struct Case {
    const char* what;
    int fd;
    size_t size;
    int error;
  };
  for (const Case& c : {Case{"size 0", fd.get(), 0, EINVAL}, Case{"bad fd", -1, kSize, EBADF}}) {
    SCOPED_TRACE(c.what);
    errno = 0;
    Mapping mapping(c.fd, c.size, PROT_READ, MAP_SHARED);
    EXPECT_FALSE(mapping.valid());
    EXPECT_EQ(nullptr, mapping.data());
    EXPECT_EQ(c.error, errno);
  }
  errno = 0;
  EXPECT_FALSE(Truncate(-1, kSize));
  EXPECT_EQ(EBADF, errno);
  errno = 0;
  EXPECT_FALSE(ShmOpen(kName, O_RDWR | O_CREAT | O_EXCL, 0600).valid());
  EXPECT_EQ(EEXIST, errno);

  ASSERT_TRUE(Truncate(fd.get(), kSize));
  {
    fault::Arm arm(1, fault::kPersistent, EDOM);
    errno = 0;
    EXPECT_FALSE(ShmOpen(kName, O_RDWR, 0).valid());
    EXPECT_EQ(EDOM, errno);
    EXPECT_FALSE(Truncate(fd.get(), 2 * kSize));
    EXPECT_FALSE(Mapping(fd.get(), kSize, PROT_READ, MAP_SHARED).valid());
    EXPECT_FALSE(ShmUnlink(kName));
    EXPECT_EQ(4, arm.calls());
  }
  struct stat st;
  ASSERT_EQ(0, ::fstat(fd.get(), &st));
  EXPECT_EQ(static_cast<off_t>(kSize), st.st_size);
  EXPECT_TRUE(ShmUnlink(kName));
}

}  // namespace
}  // namespace tavow3::base
