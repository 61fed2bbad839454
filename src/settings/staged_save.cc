#include "settings/staged_save.h"

#include "base/file_io.h"

namespace tavow3 {
namespace {

constexpr char kNginxConf[] = "/var/tmp/nginx/nginx.conf";

void CleanUp(const StagedSaveFiles& files, bool drop_conf) {
  (void)base::Unlink(files.scratch);
  if (drop_conf) (void)base::Unlink(kNginxConf);
  (void)base::Unlink(files.staging);
}

}  // namespace

bool StagedSave(W3Base* object, const StagedSaveFiles& files) {
  Json::Value value;
  if (!object->TransVarToJson(value)) return false;
  if (!object->SetJson(value)) return false;
  if (!object->Update()) {
    CleanUp(files, files.drop_conf_on_update_failure);
    return false;
  }
  if (!W3Base::MoveFile(files.staging, files.stored)) {
    CleanUp(files, files.drop_conf_on_move_failure);
    return false;
  }
  return true;
}

}  // namespace tavow3
