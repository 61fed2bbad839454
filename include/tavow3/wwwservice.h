// Settings of the general web service: the additional HTTP and HTTPS ports on
// which the hosted web content is also served, and its HTTPS settings.
#ifndef TAVOW3_WWWSERVICE_H_
#define TAVOW3_WWWSERVICE_H_

#include <memory>
#include <string>

#include <tavow3/engine.h>
#include <tavow3/engine_v2.h>
#include <tavow3/export.h>
#include <tavow3/w3base.h>

namespace tavow3 {

// Reads "/usr/tavo/etc/www/WWWService.json" on construction (defaults when it
// is missing or unreadable). It has no setters: the file is edited and the
// object re-registers and saves what it holds. Save() stages the new file in
// "/var/tmp/nginx/WWWService.json" and installs it only after the web server's
// configuration was regenerated from it. One thread at a time.
class TAVOW3_EXPORT WWWService : public W3Base {
 public:
  explicit WWWService(Engine engine);
  explicit WWWService(EngineV2 engine);
  ~WWWService() override;

  bool Update() override;
  bool Save() override;
  bool RestartService() override;
  void DataInit() override;
  bool GetJson(Json::Value& value) override;
  bool SetJson(Json::Value& value) override;
  void TransJsonToVar(Json::Value& value) override;
  bool TransVarToJson(Json::Value& value) override;

  unsigned short GetHttpAddPort() const;
  bool GetEnableHttpAddPort() const;
  unsigned short GetHttpsAddPort() const;
  bool GetEnableHttpsAddPort() const;
  std::string GetCERT() const;
  std::string GetKEY() const;
  bool GetEnableSPDY() const;
  bool GetEnableHSTS() const;

  // Load-cycle callbacks: declare the stored additional ports to the engine.
  static void ResourceRegister(Engine& engine);
  static void ResourceRegisterV2(EngineV2& engine);

 private:
  struct Settings;
  std::unique_ptr<Settings> settings_;
};

}  // namespace tavow3

#endif  // TAVOW3_WWWSERVICE_H_
