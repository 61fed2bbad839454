// Firewall service files: the registry's host-name resources of one owner
// become a JSON document that the appliance's mustache tool renders into a
// ".sc" file, which is then installed where the firewall service reads it.
#include <json/writer.h>

#include <string>

#include <tavo/tavofs.h>
#include <tavo/tlib_exec.h>
#include <tavo/tlib_file.h>
#include <tavo/tlib_service.h>
#include <tavow3/engine.h>

#include "base/file_io.h"
#include "base/log.h"
#include "engine/engine_private.h"
#include "engine/firewall_sections.h"

namespace tavow3 {
namespace {

constexpr char kLogTag[] = "engine";

constexpr char kWorkDir[] = "/var/tmp/tavow3";
constexpr char kStagingDir[] = "/var/tmp/nginx";
constexpr char kDocumentPath[] = "/var/tmp/tavow3/Firewall.json";
constexpr char kRenderedPath[] = "/var/tmp/tavow3/temp.sc";
constexpr char kMustacheTool[] = "/usr/tavo/bin/tavomustache";
constexpr char kTemplatePath[] = "/usr/tavo/share/nginx/Firewall.mustache";
constexpr char kSystemServiceDir[] = "/usr/tavo/etc/services.d";
constexpr char kPackageServiceDir[] = "/usr/local/etc/services.d";
constexpr mode_t kDirMode = 0755;
constexpr base::FileMode kWorkFileMode = {1, 1, 0644};

bool IsSystemOwner(const std::string& owner) { return owner == "tavow3"; }

std::string InstalledPath(const std::string& owner) {
  return std::string(IsSystemOwner(owner) ? kSystemServiceDir : kPackageServiceDir) + "/" +
         owner + ".sc";
}

std::string BackupPath(const std::string& owner) {
  return std::string(kWorkDir) + "/" + owner + ".sc";
}

std::string StyledJson(const Json::Value& document) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "   ";
  return Json::writeString(builder, document) + "\n";
}

// Writes the tool's input and renders it into the temporary service file.
bool RenderServiceFile(const Json::Value& sections) {
  if (TAVOFSMkdirP(kWorkDir, 0, kDirMode) != 0) {
    TAVOW3_LOG_ERR_AT(344, "make directory /var/tmp/tavow3 failed");
    return false;
  }
  if (TAVOFSMkdirP(kStagingDir, 0, kDirMode) != 0) {
    TAVOW3_LOG_ERR_AT(349, "make directory /var/tmp/nginx failed");
    return false;
  }
  Json::Value document(Json::objectValue);
  document["sections"] = sections;
  if (!base::ReplaceFile(kDocumentPath, StyledJson(document), kWorkFileMode)) {
    TAVOW3_LOG_ERR_AT(356, "Fail to write temp sc file");
    return false;
  }
  if (TLIBCExec(kMustacheTool, kTemplatePath, kDocumentPath, "-o", kRenderedPath) != 0) {
    TAVOW3_LOG_ERR_AT(361, "Fail to generate sc file through mustache");
    return false;
  }
  if (!base::Chmod(kRenderedPath, 0644)) {
    TAVOW3_LOG_ERR_AT(366, "Fail to chmod file (%s, %m)", kRenderedPath);
    return false;
  }
  return true;
}

// Keeps a copy of the installed file for HupFirewall, then installs the new one.
bool InstallServiceFile(const std::string& owner) {
  if (IsSystemOwner(owner)) {
    if (TAVOFSMkdirP(kSystemServiceDir, 0, kDirMode) != 0) {
      TAVOW3_LOG_ERR_AT(375, "make directory /usr/tavo/etc/services.d failed");
      return false;
    }
  } else if (TAVOFSMkdirP(kPackageServiceDir, 0, kDirMode) != 0) {
    TAVOW3_LOG_ERR_AT(381, "make directory /usr/local/etc/services.d failed");
    return false;
  }
  const std::string installed = InstalledPath(owner);
  const std::string backup = BackupPath(owner);
  if (TLIBCFileExist(installed.c_str()) && TAVOFileCopy(installed.c_str(), backup.c_str()) != 0) {
    TAVOW3_LOG_ERR_AT(405, "Fail to move file from %s to %s", installed.c_str(), backup.c_str());
  }
  if (TAVOFileCopy(kRenderedPath, installed.c_str()) != 0) {
    TAVOW3_LOG_ERR_AT(409, "Fail to move file from %s to %s", kRenderedPath, installed.c_str());
    return false;
  }
  return true;
}

// Applies a saved previous version of a service file: port forwarding follows
// the difference between `backup` and `installed`. A missing backup is nothing
// to apply; the backup is consumed on success.
bool ApplyBackup(const std::string& backup, const std::string& installed, int line,
                 const char* message) {
  if (!TLIBCFileExist(backup.c_str())) return true;
  const TLIB_SERVCONF_NOTIFY notify = {backup.c_str(), installed.c_str(), 0, 1};
  if (TLIBServiceConfServNotify(&notify) < 0) {
    TAVOW3_LOG_ERR_AT(line, "%s", message);
    return false;
  }
  (void)base::Unlink(backup);
  return true;
}

}  // namespace

bool Engine::GenerateFirewallConfig(const std::string& owner) {
  load();
  const Json::Value sections = BuildFirewallSections(impl(), owner);
  if (sections.empty()) {
    // An owner without resources has no file; the deletion's result decides nothing.
    (void)base::Unlink(InstalledPath(owner));
    return true;
  }
  return RenderServiceFile(sections) && InstallServiceFile(owner);
}

int Engine::W3FwReGenAll() { return GenerateFirewallConfig("tavow3") ? 1 : 0; }

bool Engine::HupFirewall() {
  if (!ApplyBackup(BackupPath("tavow3"), InstalledPath("tavow3"), 523,
                   "Failed to update tavow3 portforward")) {
    return false;
  }
  if (!ApplyBackup(BackupPath("Pagora"), InstalledPath("Pagora"), 538,
                   "Failed to update pagora portforward")) {
    return false;
  }
  const TLIB_SERVCONF_NOTIFY reload = {nullptr, nullptr, 1, 0};
  if (TLIBServiceConfServNotify(&reload) < 0) {
    TAVOW3_LOG_ERR_AT(547, "Failed to hup firewall");
    return false;
  }
  return true;
}

}  // namespace tavow3
