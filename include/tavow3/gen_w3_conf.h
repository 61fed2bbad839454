// The full preparation of the web server's configuration.
#ifndef TAVOW3_GEN_W3_CONF_H_
#define TAVOW3_GEN_W3_CONF_H_

#include <memory>

#include <tavow3/export.h>
#include <tavow3/gen_nginx_conf.h>

// Construction loads a fresh EngineV2, regenerates the firewall service file,
// synchronises the certificate information (even after a firewall failure)
// and, only when both succeeded, generates the temporary nginx configuration
// (GenNginxConf), holding the generation lock until destruction. An exception
// of the engine's load cycle (exhausted memory) passes to the caller. Used by
// one thread.
class TAVOW3_EXPORT GenW3Conf {
 public:
  GenW3Conf();
  ~GenW3Conf();
  GenW3Conf(const GenW3Conf&) = delete;
  GenW3Conf& operator=(const GenW3Conf&) = delete;

  // The generated configuration's test; false when nothing was generated.
  [[nodiscard]] bool TestNginxTmpConf();
  // Whether the firewall service file was regenerated.
  bool IsFirewallOk() const { return firewall_ok_; }
  // Whether the certificate information was synchronised.
  bool IsCertificateOk() const { return certificate_ok_; }

 private:
  std::unique_ptr<GenNginxConf> gen_;  // null unless generation ran
  bool firewall_ok_;
  bool certificate_ok_;
};

#endif  // TAVOW3_GEN_W3_CONF_H_
