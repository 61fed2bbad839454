// The settings-file primitives of W3Base: every settings file is read, written
// and moved through these.
#include <fcntl.h>
#include <json/reader.h>
#include <json/writer.h>

#include <cctype>
#include <cerrno>
#include <cstring>
#include <sstream>

#include <tavo/tavofs.h>

#include <tavow3/w3base.h>

#include "base/file_io.h"
#include "base/log.h"

namespace tavow3 {
namespace {

constexpr char kLogTag[] = "tavow3.cpp";
constexpr mode_t kFileMode = 0644;
constexpr mode_t kFolderMode = 0755;
constexpr uid_t kOwner = 1;
constexpr gid_t kGroup = 1;
// Temporary names are formatted into a buffer of this size. A longer pattern
// is cut short, and mkstemp refuses it for want of its trailing X's.
constexpr size_t kTempNameBuffer = 1024;

bool IsBlank(const std::string& text) {
  for (unsigned char c : text) {
    if (!std::isspace(c)) return false;
  }
  return true;
}

// "%s.XXXXXX" of `path`, as much of it as fits in kTempNameBuffer with the
// terminating zero.
std::string TempPattern(const std::string& path) {
  return (path + ".XXXXXX").substr(0, kTempNameBuffer - 1);
}

// The temporary name beside `path`. When mkstemp fails the pattern itself is
// used, as the file is reopened by name anyway.
std::string MakeTempBeside(const std::string& path) {
  const std::string pattern = TempPattern(path);
  std::string temp;
  base::UniqueFd fd = base::MakeTemp(pattern, &temp);
  if (!fd) {
    TAVOW3_LOG_ERR("Fail to create temp file (%s, %s)", path.c_str(), std::strerror(errno));
    return pattern;
  }
  return temp;
}

}  // namespace

bool W3Base::ReadJsonFile(const std::string& path, Json::Value& out, bool allowMissing) {
  if (path.empty()) {
    TAVOW3_LOG_ERR("No json file name given to read!");
    return false;
  }
  base::UniqueFd fd = base::Open(path, O_RDONLY);
  if (!fd) {
    if (allowMissing && errno == ENOENT) return true;
    TAVOW3_LOG_ERR("Fail to fopen file (%s, %s)", path.c_str(), std::strerror(errno));
    return false;
  }
  std::string content;
  errno = 0;
  if (!base::ReadAll(fd.get(), &content)) {
    TAVOW3_LOG_ERR("Fail to fopen file (%s, %s)", path.c_str(), std::strerror(errno));
    return false;
  }
  if (IsBlank(content)) {
    if (allowMissing) return true;
    TAVOW3_LOG_ERR("File [%s] cannont be empty!", path.c_str());
    return false;
  }
  Json::Value parsed;
  Json::Reader reader;
  if (!reader.parse(content, parsed, /*collectComments=*/false)) {
    TAVOW3_LOG_ERR("File [%s] formate is wrong!", path.c_str());
    return false;
  }
  out = parsed;
  return true;
}

bool W3Base::WriteJsonFile(const std::string& path, const Json::Value& value) {
  if (path.empty()) {
    TAVOW3_LOG_ERR("No json file name given to write!");
    return false;
  }
  if (!MakeParentFolderExist(path)) return false;
  const std::string temp = MakeTempBeside(path);
  base::UniqueFd fd = base::Open(temp, O_WRONLY | O_CREAT | O_TRUNC, kFileMode);
  if (!fd) {
    TAVOW3_LOG_ERR("Fail to fopen file (%s, %s)", temp.c_str(), std::strerror(errno));
    (void)base::Unlink(temp);
    return false;
  }
  std::ostringstream styled;
  Json::StyledStreamWriter().write(styled, value);
  if (!base::WriteAll(fd.get(), styled.str())) {
    TAVOW3_LOG_ERR("Fail to write file (%s, %s)", temp.c_str(), std::strerror(errno));
    (void)base::Unlink(temp);
    return false;
  }
  if (!base::Chown(temp, kOwner, kGroup)) {
    TAVOW3_LOG_ERR("Fail to chown file (%s, %s)", temp.c_str(), std::strerror(errno));
    (void)base::Unlink(temp);
    return false;
  }
  if (!base::Chmod(temp, kFileMode)) {
    TAVOW3_LOG_ERR("Fail to chmod file (%s, %s)", temp.c_str(), std::strerror(errno));
    (void)base::Unlink(temp);
    return false;
  }
  if (!fd.Reset()) {
    TAVOW3_LOG_ERR("Fail to write file (%s, %s)", temp.c_str(), std::strerror(errno));
    (void)base::Unlink(temp);
    return false;
  }
  errno = 0;
  if (!base::Rename(temp, path)) {
    // The write itself was complete: reported in the log only.
    TAVOW3_LOG_ERR("Fail to rename file from %s to %s, %s", temp.c_str(), path.c_str(),
                   std::strerror(errno));
    (void)base::Unlink(temp);
  }
  return true;
}

bool W3Base::MoveFile(const std::string& from, const std::string& to) {
  bool ok = false;
  std::string temp;
  if (MakeParentFolderExist(to)) {
    base::UniqueFd temp_fd = base::MakeTemp(TempPattern(to), &temp);
    if (!temp_fd) {
      TAVOW3_LOG_ERR("Fail to create temp file (%s, %s)", to.c_str(), std::strerror(errno));
      temp.clear();
    } else {
      ok = true;
    }
  }
  if (ok) {
    base::UniqueFd in = base::Open(from, O_RDONLY);
    base::UniqueFd out = base::Open(temp, O_WRONLY | O_TRUNC);
    std::string content;
    if (!in) {
      TAVOW3_LOG_ERR("Cannot open file %s", from.c_str());
      ok = false;
    } else if (!out) {
      TAVOW3_LOG_ERR("Cannot open tmp file %s", temp.c_str());
      ok = false;
    } else if (!base::ReadAll(in.get(), &content) || !base::WriteAll(out.get(), content) ||
               !out.Reset()) {
      TAVOW3_LOG_ERR("Fail to write file (%s, %s)", temp.c_str(), std::strerror(errno));
      ok = false;
    } else if (!base::Chmod(temp, kFileMode)) {
      TAVOW3_LOG_ERR("Fail to chmod file (%s, %s)", temp.c_str(), std::strerror(errno));
      ok = false;
    } else {
      errno = 0;
      if (!base::Rename(temp, to)) {
        // The copy was complete: reported in the log only.
        TAVOW3_LOG_ERR("Fail to rename file from %s to %s, %s", temp.c_str(), to.c_str(),
                       std::strerror(errno));
        (void)base::Unlink(temp);
      }
    }
  }
  if (!ok && !temp.empty()) (void)base::Unlink(temp);
  // The source goes on every path, failed moves included.
  (void)base::Unlink(from);
  return ok;
}

bool W3Base::MakeParentFolderExist(const std::string& path) {
  if (path.empty()) {
    TAVOW3_LOG_ERR("No path found");
    return false;
  }
  const size_t slash = path.rfind('/');
  if (slash == std::string::npos) {
    TAVOW3_LOG_ERR("No parent folder found");
    return false;
  }
  const std::string folder = path.substr(0, slash);
  if (TAVOFSMkdirP(folder.c_str(), 0, 1, kOwner, kGroup, kFolderMode) != 0) {
    TAVOW3_LOG_ERR("make directory exist failed (%s, %s)", folder.c_str(), std::strerror(errno));
    return false;
  }
  return true;
}

}  // namespace tavow3
