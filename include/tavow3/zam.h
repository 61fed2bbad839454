// Settings of the appliance's management web interface: its HTTP and HTTPS
// ports, HTTPS options, custom domain, connection limit, server header and
// trusted proxies.
#ifndef TAVOW3_ZAM_H_
#define TAVOW3_ZAM_H_

#include <json/value.h>
#include <tavow3/engine.h>
#include <tavow3/engine_v2.h>
#include <tavow3/export.h>
#include <tavow3/port_validator.h>
#include <tavow3/resource.h>
#include <tavow3/w3base.h>

#include <memory>
#include <string>
#include <vector>

namespace tavow3 {

// Reads "/usr/tavo/etc/www/ZAM.json" on construction; when that file is
// missing or broken the built-in defaults (ports 5000 and 5001) are in force
// and OK() is false. Port and custom-domain setters change the engine's
// registrations at once; the other setters change only the object until
// Save(), which stages "/var/tmp/nginx/ZAM.json", regenerates the web
// server's configuration from it and only then installs it. One thread at a
// time; processes are serialised by the engine's lock file.
class TAVOW3_EXPORT ZAM : public W3Base {
 public:
  explicit ZAM(Engine engine);
  explicit ZAM(EngineV2 engine);
  ~ZAM() override;

  // W3Base::Update(): generate and test the web server's configuration, then
  // the firewall service files.
  bool Update() override;
  // Registers (or, without a custom domain, unregisters) the custom domain's
  // certificate, then saves in stages. False leaves the stored file as it was.
  bool Save() override;
  // Reloads the web server and, when that worked, notifies the firewall.
  bool RestartService() override;
  void DataInit() override;
  // Reads the stored file. When it cannot be read the factory file
  // "/usr/tavo/etc.defaults/www/ZAM.json" is read (and logged) but the result
  // is false all the same: the built-in defaults stay authoritative.
  bool GetJson(Json::Value& value) override;
  // Writes the staging file "/var/tmp/nginx/ZAM.json".
  bool SetJson(Json::Value& value) override;
  void TransJsonToVar(Json::Value& value) override;
  bool TransVarToJson(Json::Value& value) override;

  // Flag setters: mark the object dirty only when the value changes; always true.
  bool SetEnableSPDY(bool enable);
  bool SetEnableSPDY();
  bool SetDisableSPDY();
  bool GetEnableSPDY() const;
  bool setHSTS(bool enable);
  bool getHSTS() const;
  bool SetEnableHttpsRedirect(bool enable);
  bool SetEnableHttpsRedirect();
  bool SetDisableHttpsRedirect();
  bool GetEnableHttpsRedirect() const;
  bool SetEnableAccessDefaultPort(bool enable);
  bool SetEnableAccessDefaultPort();
  bool SetDisableAccessDefaultPort();
  bool GetEnableAccessDefaultPort() const;
  bool setHTTPCompression(bool enable);
  bool getHTTPCompression() const;

  // 5000 and 5001: the ports of the management-only fall-back configuration.
  unsigned short GetHttpDefaultPort() const;
  unsigned short GetHttpsDefaultPort() const;
  // The stored port, or the default port while the web server runs its
  // Default configuration (asks the configuration manager each time).
  unsigned short GetHttpPort() const;
  unsigned short GetHttpsPort() const;
  // Moves the port's registration (and that of the custom domain on it) to
  // the requested port. True when the port is the current one or was taken;
  // false for port 0 or a port the engine refuses, with every registration
  // as it was.
  bool SetHttpPort(PortValidator validator);
  bool SetHttpsPort(PortValidator validator);

  // Sets the custom domain ("" clears it), moving its four registrations.
  // 0 success or unchanged, 1 invalid host name, 2 refused by the engine
  // (nothing left registered for the new name).
  int setFQDNEx(const std::string& fqdn);
  // setFQDNEx() == 0.
  bool setFQDN(const std::string& fqdn);
  std::string getFQDN() const;

  // Connection limit: the total over all web-server workers, one worker per
  // processor. These setters do not mark the object dirty.
  // False, changing nothing, outside [lower limit, upper limit]; otherwise
  // stores the limit and marks it customised.
  bool SetMaxConnections(int max_connections);
  // Not customised also resets the stored limit to 0. Always true.
  bool SetEnableCustomizedMaxConnections(bool enable);
  // The customised limit, else the lower limit.
  int GetMaxConnections() const;
  bool IsCustomizedMaxConnections() const;
  int GetUpperLimitMaxConnections() const;
  int GetLowerLimitMaxConnections() const;
  // `max_connections` clamped to the limits.
  int CorrectMaxConnections(int max_connections) const;
  // Per-worker setting for a total, and back, on this machine's processors.
  static int MAX2WorkerConnections(int max_connections);
  static int Worker2MaxConnections(int worker_connections);

  // TLS profile 0 to 2, kept as the service level of "zam" in the platform's
  // TLS data store rather than in the settings file. An unknown level reads
  // as profile 1. The setter refuses other profiles and writes the store at
  // once when the profile changes.
  int getTLSProfile() const;
  bool setTLSProfile(int profile);

  // The "Server" header: disabled (empty) or `name`. Not marked dirty; true.
  bool SetServerHeader(bool enable, const std::string& name);
  std::string GetServerHeader() const;
  bool GetEnableServerHeader() const;

  // Addresses whose forwarded client address the web server trusts.
  // Not marked dirty; true.
  bool SetTrustProxyList(const std::vector<std::string>& proxies);
  std::vector<std::string> GetTrustProxyList() const;

  // Registers the custom domain's certificate with the certificate store
  // (subscriber "system", service "FQDN"), or unregisters it when there is no
  // custom domain. Logs and returns false on failure.
  bool ProcessCertificate();

  // Load-cycle callbacks: declare the stored ports (80, 443 and the
  // interface's own two) and the custom domain on each; the V2 form also
  // declares the custom domain's certificate.
  static void ResourceRegister(Engine& engine);
  static void ResourceRegisterV2(EngineV2& engine);

 private:
  struct Settings;
  // Registers the interface's port resource of `schema` on `port`, then the
  // custom domain on it; rolls the first back when the second is refused.
  bool RegisterPort(unsigned short port, FQDNPortSchemaResource::Schema schema);
  // The steps of SetHttpPort/SetHttpsPort on the stored port *port.
  bool SetPort(PortValidator validator, FQDNPortSchemaResource::Schema schema,
               unsigned short* port);

  std::unique_ptr<Settings> settings_;
};

}  // namespace tavow3

#endif  // TAVOW3_ZAM_H_
