// The web server's configuration mode, remembered across processes until the
// next boot, and the administrators' alert when a fall-back mode is entered.
#ifndef TAVOW3_NGINX_MODE_RECORDER_H_
#define TAVOW3_NGINX_MODE_RECORDER_H_

#include <tavow3/export.h>
#include <tavow3/nginx_conf_type.h>

// The record is the POSIX shared-memory object "nginx_mod": 4096 bytes
// holding the mode as decimal text, the rest zero. Writers are serialised by
// the callers (the generation lock); reads and writes copy the whole record.
// Thread-safe in the sense that every call stands alone.
class TAVOW3_EXPORT NginxModeRecorder {
 public:
  // The recorded mode 0, 1 or 2; -1 when no valid record exists.
  [[nodiscard]] static int GetMode();

  // Records `mode` and, for a mode other than Normal while the force-default
  // flag is absent, raises the alert (EmitAlert). Failures are logged only:
  // the result is always true. NGINXCONF_NONE records nothing.
  [[nodiscard]] static bool RecordMode(NGINXCONF_TYPE mode);

  // Notifies the administrators that the web server fell back: at once for
  // Default; for any other mode from a detached process that waits 13 seconds
  // and notifies only when the record then is still not Normal and the
  // force-default flag is absent. Returns without waiting for that delay and
  // leaves no child to reap.
  static void EmitAlert(NGINXCONF_TYPE mode);
};

#endif  // TAVOW3_NGINX_MODE_RECORDER_H_
