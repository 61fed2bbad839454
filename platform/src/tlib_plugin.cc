#include "tavo/tlib_plugin.h"

#include <dirent.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <map>
#include <new>
#include <string>
#include <vector>

#include "spawn.h"

extern char** environ;

struct TLIB_PLUGIN {
  std::string category;
  std::string name;
  std::map<std::string, std::string> args;  // key without the TAVO_ prefix
};

namespace {

constexpr char kPackageDir[] = "/var/packages";
constexpr char kEnvPrefix[] = "TAVO_";

bool IsPathComponent(const char* text) {
  return text != nullptr && text[0] != '\0' && std::strchr(text, '/') == nullptr &&
         std::strcmp(text, ".") != 0 && std::strcmp(text, "..") != 0;
}

bool IsArgKey(const char* key) {
  if (key == nullptr || key[0] == '\0') return false;
  for (const char* c = key; *c != '\0'; ++c) {
    bool ok = (*c >= 'a' && *c <= 'z') || (*c >= 'A' && *c <= 'Z') || (*c >= '0' && *c <= '9') ||
              *c == '_';
    if (!ok) return false;
  }
  return true;
}

// The installed packages in name order. False when the package directory
// exists but cannot be listed.
bool ListPackages(std::vector<std::string>* packages) {
  DIR* dir = ::opendir(kPackageDir);
  if (dir == nullptr) return errno == ENOENT || errno == ENOTDIR;
  errno = 0;
  while (const dirent* entry = ::readdir(dir)) {
    if (std::strcmp(entry->d_name, ".") != 0 && std::strcmp(entry->d_name, "..") != 0) {
      packages->emplace_back(entry->d_name);
    }
  }
  int error = errno;
  ::closedir(dir);
  std::sort(packages->begin(), packages->end());
  errno = error;
  return error == 0;
}

// The caller's environment without the variables the hook arguments set,
// followed by those.
std::vector<std::string> HookEnvironment(const TLIB_PLUGIN& plugin) {
  std::vector<std::string> env;
  for (char** var = environ; var != nullptr && *var != nullptr; ++var) {
    std::string entry(*var);
    std::string::size_type equals = entry.find('=');
    std::string key = entry.substr(0, equals);
    bool replaced = key.compare(0, sizeof kEnvPrefix - 1, kEnvPrefix) == 0 &&
                    plugin.args.count(key.substr(sizeof kEnvPrefix - 1)) != 0;
    if (!replaced) env.push_back(std::move(entry));
  }
  for (const auto& [key, value] : plugin.args) env.push_back(kEnvPrefix + key + "=" + value);
  return env;
}

bool IsRegularFile(const std::string& path) {
  struct stat st;
  return ::stat(path.c_str(), &st) == 0 && S_ISREG(st.st_mode);
}

}  // namespace

TLIB_PLUGIN* TLIBPluginSDKInit(const char* category, const char* name) {
  if (!IsPathComponent(category) || !IsPathComponent(name)) {
    errno = EINVAL;
    return nullptr;
  }
  auto* plugin = new (std::nothrow) TLIB_PLUGIN;
  if (plugin == nullptr) {
    errno = ENOMEM;
    return nullptr;
  }
  try {
    plugin->category = category;
    plugin->name = name;
  } catch (const std::bad_alloc&) {
    delete plugin;
    errno = ENOMEM;
    return nullptr;
  }
  return plugin;
}

int TLIBPluginSetArg(TLIB_PLUGIN* plugin, const char* key, const char* value) {
  if (plugin == nullptr || !IsArgKey(key) || value == nullptr) {
    errno = EINVAL;
    return -1;
  }
  try {
    plugin->args[key] = value;
  } catch (const std::bad_alloc&) {
    errno = ENOMEM;
    return -1;
  }
  return 0;
}

int TLIBPluginSetArgByInt(TLIB_PLUGIN* plugin, const char* key, int value) {
  return TLIBPluginSetArg(plugin, key, std::to_string(value).c_str());
}

int TLIBPluginAction(TLIB_PLUGIN* plugin, int action) {
  if (plugin == nullptr) {
    errno = EINVAL;
    return -1;
  }
  try {
    std::vector<std::string> packages;
    if (!ListPackages(&packages)) return -1;
    std::vector<std::string> env = HookEnvironment(*plugin);
    std::vector<const char*> envp;
    for (const std::string& entry : env) envp.push_back(entry.c_str());
    envp.push_back(nullptr);
    std::string action_text = std::to_string(action);
    int result = 0;
    for (const std::string& package : packages) {
      std::string hook = std::string(kPackageDir) + "/" + package + "/target/hooks/" +
                         plugin->category + "/" + plugin->name;
      if (!IsRegularFile(hook)) continue;
      const char* argv[] = {hook.c_str(), action_text.c_str(), nullptr};
      tavo::internal::SpawnSpec spec;
      spec.argv = argv;
      spec.envp = envp.data();
      spec.null_stdin = true;
      int status = tavo::internal::SpawnAndWait(spec);
      if (result == 0 && status != 0) result = status;
    }
    return result;
  } catch (const std::bad_alloc&) {
    errno = ENOMEM;
    return -1;
  }
}

void TLIBPluginExit(TLIB_PLUGIN* plugin) { delete plugin; }
