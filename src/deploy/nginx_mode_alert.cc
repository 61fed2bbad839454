// The administrators' alert when the web server falls back to another mode.
#include <unistd.h>

#include <atomic>
#include <cstdlib>
#include <string>
#include <vector>

#include <tavo/tlib_exec.h>
#include <tavow3/nginx_mode_recorder.h>

#include "base/child_process.h"
#include "base/file_io.h"
#include "base/log.h"
#include "base/unique_fd.h"
#include "deploy/alert_delay.h"
#include "deploy/force_default_flag.h"

namespace {

namespace base = tavow3::base;

constexpr char kLogTag[] = "nginx_deploy";
constexpr char kNotifyTool[] = "/usr/tavo/bin/tavozamnotify";

std::atomic<unsigned> g_alert_delay{tavow3::deploy::kAlertDelaySeconds};

void SendNotification() {
  // The widget key is the notification's identifier, spelling included.
  (void)TLIBCExec(kNotifyTool, "@administrators", "zamnotify:system_event",
                  "widget:apache_statup_failed");
}

// The alert process outlives the caller's call by the delay. It must not keep
// the caller's descriptors: an inherited lock file (the generation lock, the
// engine's lock) would stay locked until the alert process exits.
void CloseInheritedDescriptors() {
  std::vector<std::string> names;
  if (!base::ListDir("/proc/self/fd", &names)) return;
  for (const std::string& name : names) {
    const int fd = std::atoi(name.c_str());
    if (fd > STDERR_FILENO) (void)base::UniqueFd(fd).Reset();
  }
}

// Runs `body` in a forked child and ends the child with status 0. A copy of
// the caller must never return or unwind into the caller's frames.
template <typename Body>
[[noreturn]] void RunChild(Body body) {
  try {
    body();
  } catch (...) {
  }
  base::Exit(0);
}

// Body of the detached process.
void RunDelayedAlert(unsigned delay) {
  CloseInheritedDescriptors();
  base::SleepSeconds(delay);
  if (NginxModeRecorder::GetMode() != NGINXCONF_NORMAL &&
      !tavow3::deploy::IsForceDefaultFlagSet()) {
    SendNotification();
  }
}

// Body of the intermediate child: starts the detached process and leaves at
// once, so the caller waits only for this short-lived child and the detached
// process is reaped by init.
void DetachDelayedAlert(unsigned delay) {
  const pid_t grandchild = base::Fork();
  if (grandchild == 0) RunChild([delay] { RunDelayedAlert(delay); });
  if (grandchild < 0) {
    TAVOW3_LOG_ERR_AT(694, "Failed to fork process, emit alert immediately");
    SendNotification();
  }
}

}  // namespace

namespace tavow3::deploy {

void SetAlertDelayForTesting(unsigned seconds) { g_alert_delay.store(seconds); }

}  // namespace tavow3::deploy

void NginxModeRecorder::EmitAlert(NGINXCONF_TYPE mode) {
  if (mode == NGINXCONF_DEFAULT) {
    SendNotification();
    return;
  }
  const unsigned delay = g_alert_delay.load();
  const pid_t child = base::Fork();
  if (child == 0) RunChild([delay] { DetachDelayedAlert(delay); });
  if (child < 0) {
    TAVOW3_LOG_ERR_AT(687, "Failed to fork process, emit alert immediately");
    SendNotification();
    return;
  }
  int status = 0;
  (void)base::WaitPid(child, &status, 0);
}
