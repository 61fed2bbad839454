// Base of every settings object: the engine it registers with, the load,
// save and apply sequence, and the settings-file primitives.
#ifndef TAVOW3_W3BASE_H_
#define TAVOW3_W3BASE_H_

#include <json/value.h>

#include <memory>
#include <string>

#include <tavow3/engine.h>
#include <tavow3/export.h>

namespace tavow3 {

class EngineV2;

// A settings object keeps its own copy of the engine handle it was built with,
// so the registry lives at least as long as the object. Objects are used by
// one thread at a time; processes are serialised by the engine's lock file.
// Failures are logged to syslog and reported as false; exceptions of the JSON
// library pass through Get() and Save().
class TAVOW3_EXPORT W3Base {
 public:
  explicit W3Base(Engine engine);
  explicit W3Base(EngineV2 engine);
  virtual ~W3Base();
  W3Base(const W3Base&) = delete;
  W3Base& operator=(const W3Base&) = delete;

  // Generates the web server's configuration (generation operator) and then
  // the firewall service files. On a failed generation the temporary
  // "/var/tmp/nginx/nginx.conf" is deleted.
  virtual bool Update();
  // Writes the settings under the engine's lock, held exclusive for the write
  // and shared again on every path. False without a lock.
  virtual bool Save();
  // Save(), then RestartService() only when the save succeeded.
  virtual bool Set();
  // Reloads the web server through the platform's service control.
  virtual bool RestartService();
  // Loads the stored settings over the defaults. False (defaults in force)
  // when the engine has no lock or the file cannot be read.
  virtual bool Get();
  // Puts every setting to its default and clears the dirty and ok flags.
  virtual void DataInit() = 0;
  // Reads the object's settings file into `value`.
  virtual bool GetJson(Json::Value& value) = 0;
  // Writes `value` to the object's (staging) settings file.
  virtual bool SetJson(Json::Value& value) = 0;
  // Copies the present, well-typed keys of `value` into the settings.
  virtual void TransJsonToVar(Json::Value& value) = 0;
  // Builds the settings document into `value`.
  virtual bool TransVarToJson(Json::Value& value) = 0;

  void SetOK(bool ok);
  void SetDirty(bool dirty);
  bool OK() const;
  bool Dirty() const;
  // The engine handle; for an object built from an EngineV2, its carried Engine.
  Engine engine() const;
  // The EngineV2 handle; meaningful only for an object built from one.
  EngineV2 engine_v2() const;

  // Parses the JSON file `path` into `out`. With `allowMissing`, a missing or
  // empty file is success with `out` untouched.
  static bool ReadJsonFile(const std::string& path, Json::Value& out, bool allowMissing);
  // Replaces `path` with the styled JSON of `value` (owner 1:1, mode 0644),
  // creating parent folders. A failed final rename is logged but still true.
  static bool WriteJsonFile(const std::string& path, const Json::Value& value);
  // Copies `from` over `to` through a temporary file (mode 0644), then deletes
  // `from`, on success and failure alike. A failed final rename is logged but
  // still true.
  static bool MoveFile(const std::string& from, const std::string& to);
  // Creates the folders above `path` (owner 1:1, mode 0755).
  static bool MakeParentFolderExist(const std::string& path);

 private:
  struct Private;
  std::unique_ptr<Private> d_;
};

}  // namespace tavow3

#endif  // TAVOW3_W3BASE_H_
