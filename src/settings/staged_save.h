// The save of the settings objects that feed the web server's configuration:
// the new settings go to a staging file, the configuration is regenerated from
// it, and only then does the staging file replace the stored one.
#ifndef TAVOW3_SRC_SETTINGS_STAGED_SAVE_H_
#define TAVOW3_SRC_SETTINGS_STAGED_SAVE_H_

#include <tavow3/w3base.h>

namespace tavow3 {

struct StagedSaveFiles {
  const char* staging;               // written by SetJson
  const char* stored;                // replaced by the staging file on success
  const char* scratch;               // deleted on failure
  bool drop_conf_on_update_failure;  // delete "/var/tmp/nginx/nginx.conf" when Update() fails
  bool drop_conf_on_move_failure;    // ... when the final move fails
};

// TransVarToJson, SetJson, Update, then MoveFile(staging, stored); the files
// are cleaned up as `files` says on failure. Takes no engine lock.
bool StagedSave(W3Base* object, const StagedSaveFiles& files);

}  // namespace tavow3

#endif  // TAVOW3_SRC_SETTINGS_STAGED_SAVE_H_
