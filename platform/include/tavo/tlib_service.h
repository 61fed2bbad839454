// Service control of the core platform library. Services are controlled by
// their scripts "/usr/tavo/etc/rc.sysv/<name>.sh" with the verbs start, stop,
// reload and status. Thread-safe.
#ifndef TAVO_TLIB_SERVICE_H_
#define TAVO_TLIB_SERVICE_H_

// Service states reported by TLIBServicectlStatus.
enum {
  TLIB_SERVICE_STOPPED = 0,
  TLIB_SERVICE_RUNNING = 5,
};

// Runs the service's script with "reload" (standard input from /dev/null) and
// waits for it. Returns the script's exit status (0 success), -1 when the
// script is missing, could not run or died by a signal, or when `name` is not
// a single file name (errno EINVAL).
int TLIBServiceReload(const char* name);

// Reports whether the service runs: its pid file "/run/<name>.pid" names a
// living process. A missing pid file, one that holds no process id, and a
// process that has exited (a zombie too) mean stopped. On success returns 0,
// stores that process id (or 0) in `*pid` and TLIB_SERVICE_RUNNING or
// TLIB_SERVICE_STOPPED in `*state`. Returns -1 with errno set (EINVAL for a
// null output or a name that is not a single file name; the error of reading
// the pid file otherwise) and leaves the outputs unchanged.
int TLIBServicectlStatus(const char* name, int* pid, int* state);

// A change of firewall service files, or a plain firewall reload.
struct TLIB_SERVCONF_NOTIFY {
  const char* old_file;   // the previous service file, or null
  const char* new_file;   // the installed service file, or null
  int reload;             // non-zero: reload the firewall
  int update;             // non-zero: apply the changed ports (port forwarding)
};

// Tells the firewall service that service files changed: runs
// "/usr/tavo/bin/tavofirewall --reload", followed by the old and the new file
// when both are given, and waits. Returns 0 on success, the tool's non-zero
// exit status, or -1 when it could not run, died by a signal or `notify` is
// null. The two flags are not passed on: the tool reloads and updates alike.
int TLIBServiceConfServNotify(const TLIB_SERVCONF_NOTIFY* notify);

#endif  // TAVO_TLIB_SERVICE_H_
