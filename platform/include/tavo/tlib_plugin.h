// Package plug-in hooks. A hook is identified by a category and a name
// ("app_portal", "app_portal_set"); every installed package may provide an
// executable "/var/packages/<package>/target/hooks/<category>/<name>" for it.
// An action runs each such executable in package-name order with the action
// number as its only argument and every argument set so far in its
// environment as TAVO_<KEY>=<value>. A handle is used by one thread at a time.
#ifndef TAVO_TLIB_PLUGIN_H_
#define TAVO_TLIB_PLUGIN_H_

struct TLIB_PLUGIN;

// Opens the hook. Returns a new handle that TLIBPluginExit frees, or null with
// errno set (EINVAL for a category or name that is not a single file name).
TLIB_PLUGIN* TLIBPluginSDKInit(const char* category, const char* name);

// Sets a string argument; a later value of the same key replaces the earlier.
// Returns 0, or -1 with errno EINVAL for a null handle or value, or a key that
// is empty or holds anything but letters, digits and '_'.
int TLIBPluginSetArg(TLIB_PLUGIN* plugin, const char* key, const char* value);

// Sets an integer argument, written in decimal. Results as TLIBPluginSetArg.
int TLIBPluginSetArgByInt(TLIB_PLUGIN* plugin, const char* key, int value);

// Runs the hooks for `action` and waits for each. Returns 0 when every hook
// exited 0 (or there is none), else the first non-zero exit status (-1 when a
// hook could not run or died by a signal); later hooks still run. Also -1
// when "/var/packages" exists but cannot be listed. Hooks get standard input
// from /dev/null and no descriptor above 2.
int TLIBPluginAction(TLIB_PLUGIN* plugin, int action);

// Frees the handle; null is ignored.
void TLIBPluginExit(TLIB_PLUGIN* plugin);

#endif  // TAVO_TLIB_PLUGIN_H_
