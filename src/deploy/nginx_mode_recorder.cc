// The mode record: the shared-memory object "nginx_mod".
#include <tavow3/nginx_mode_recorder.h>

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "base/file_io.h"
#include "base/log.h"
#include "base/shared_memory.h"
#include "base/unique_fd.h"
#include "deploy/force_default_flag.h"

namespace {

namespace base = tavow3::base;

constexpr char kLogTag[] = "nginx_deploy";
constexpr char kShmName[] = "nginx_mod";
constexpr size_t kRecordSize = 4096;
constexpr mode_t kRecordMode = 0644;

// Reading a page of the mapping that lies wholly past the object's end raises
// SIGBUS: an empty object (another process is between creating and sizing it)
// must not be read. Bytes past the end within the object's last page read as
// zero, as the record's padding does. Checked through the descriptor's /proc
// link, which names the very object; without /proc the check is skipped.
bool WouldFaultOnRead(int fd) {
  struct stat st;
  if (!base::Stat("/proc/self/fd/" + std::to_string(fd), &st)) return false;
  const off_t page = ::sysconf(_SC_PAGESIZE);
  const off_t backed = (st.st_size + page - 1) / page * page;
  return backed < static_cast<off_t>(kRecordSize);
}

// Maps the record of `fd` and parses it: the mode, or -1.
int ReadRecord(int fd) {
  if (WouldFaultOnRead(fd)) return -1;
  base::Mapping mapping(fd, kRecordSize, PROT_READ, MAP_SHARED);
  if (!mapping) return -1;
  char text[kRecordSize];
  std::memcpy(text, mapping.data(), kRecordSize);
  text[kRecordSize - 1] = '\0';
  if (std::strlen(text) != 1) {
    TAVOW3_LOG_ERR_AT(650, "Bad nginx mode record data");
    return -1;
  }
  if (text[0] == '0') return 0;
  // Any other digit or a letter (which converts to 0) is no mode.
  const long value = std::strtol(text, nullptr, 10);
  return value == 1 || value == 2 ? static_cast<int>(value) : -1;
}

// Writes the whole record through a mapping of `fd` and raises the alert
// while it is mapped. Nothing is written when the mapping fails.
void WriteRecord(int fd, NGINXCONF_TYPE mode) {
  base::Mapping mapping(fd, kRecordSize, PROT_READ | PROT_WRITE, MAP_SHARED);
  if (!mapping) return;
  char text[kRecordSize] = {};
  std::snprintf(text, sizeof text, "%d", static_cast<int>(mode));
  std::memcpy(mapping.data(), text, kRecordSize);
  if (mode != NGINXCONF_NORMAL && !tavow3::deploy::IsForceDefaultFlagSet()) {
    NginxModeRecorder::EmitAlert(mode);
  }
}

}  // namespace

int NginxModeRecorder::GetMode() {
  base::UniqueFd fd = base::ShmOpen(kShmName, O_RDONLY, kRecordMode);
  if (!fd) {
    TAVOW3_LOG_ERR_AT(635, "Failed to open share memory, %m");
    return -1;
  }
  const int mode = ReadRecord(fd.get());
  if (!fd.Reset()) TAVOW3_LOG_ERR_AT(671, "Failed to close share memory, %m");
  return mode;
}

bool NginxModeRecorder::RecordMode(NGINXCONF_TYPE mode) {
  if (mode == NGINXCONF_NONE) {
    TAVOW3_LOG_ERR_AT(719, "Bad nginx mode to record");
    return true;
  }
  base::UniqueFd fd = base::ShmOpen(kShmName, O_RDWR | O_CREAT, kRecordMode);
  if (!fd) {
    TAVOW3_LOG_ERR_AT(726, "Failed to open share memory, %m");
    return true;
  }
  if (base::Truncate(fd.get(), kRecordSize)) {
    WriteRecord(fd.get(), mode);
  } else {
    TAVOW3_LOG_ERR_AT(731, "Failed to truncate shm file");
  }
  if (!fd.Reset()) TAVOW3_LOG_ERR_AT(755, "Failed to close share memory, %m");
  return true;
}
