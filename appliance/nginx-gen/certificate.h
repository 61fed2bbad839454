// The self-signed certificate of the HTTPS ports until an administrator
// installs another.
#ifndef TAVO_APPLIANCE_NGINX_GEN_CERTIFICATE_H_
#define TAVO_APPLIANCE_NGINX_GEN_CERTIFICATE_H_

#include <string>

namespace tavonginxgen {

inline constexpr char kCertificateDir[] = "/usr/tavo/etc/ssl/default";
inline constexpr char kCertificatePath[] = "/usr/tavo/etc/ssl/default/server.crt";
inline constexpr char kKeyPath[] = "/usr/tavo/etc/ssl/default/server.key";

// Makes a self-signed certificate and its key (mode 0600) with openssl when
// either file is missing; existing files are kept. Both are written under
// temporary names and renamed into place, the key first, so a reader never
// sees a certificate without its key. False with a message in *error.
bool EnsureCertificate(std::string* error);

}  // namespace tavonginxgen

#endif  // TAVO_APPLIANCE_NGINX_GEN_CERTIFICATE_H_
