#include "certificate.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <vector>

#include "files.h"
#include "output_file.h"

namespace tavonginxgen {
namespace {

constexpr char kOpenssl[] = "/usr/bin/openssl";

// Reserves a hidden temporary name beside `path` for openssl to write to.
bool ReserveName(const std::string& path, std::string* temp, std::string* error) {
  const int fd = tavomustache::MakeHiddenTemp(path, temp, error);
  if (fd < 0) return false;
  ::close(fd);
  return true;
}

}  // namespace

bool EnsureCertificate(std::string* error) {
  if (FileExists(kCertificatePath) && FileExists(kKeyPath)) return true;
  std::string key_temp, crt_temp;
  if (!MakeDirectories(kCertificateDir, error) || !ReserveName(kKeyPath, &key_temp, error)) {
    return false;
  }
  // mkstemp made the key's file with mode 0600; openssl truncates it in place.
  bool ok = ReserveName(kCertificatePath, &crt_temp, error);
  if (ok) {
    std::string output;
    const int status = RunCollecting(
        {kOpenssl, "req", "-x509", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:prime256v1",
         "-nodes", "-days", "3650", "-subj", "/CN=tavo-appliance", "-keyout", key_temp, "-out",
         crt_temp},
        &output);
    ok = status == 0;
    if (!ok) *error = "openssl could not make the certificate (status " +
                      std::to_string(status) + "): " + output;
  }
  if (ok && ::chmod(crt_temp.c_str(), 0644) != 0) {
    ok = false;
    *error = "cannot make " + crt_temp + " readable";
  }
  if (ok && (::rename(key_temp.c_str(), kKeyPath) != 0 ||
             ::rename(crt_temp.c_str(), kCertificatePath) != 0)) {
    ok = false;
    *error = std::string("cannot install the certificate in ") + kCertificateDir;
  }
  if (!ok) {
    (void)::unlink(key_temp.c_str());
    if (!crt_temp.empty()) (void)::unlink(crt_temp.c_str());
  }
  return ok;
}

}  // namespace tavonginxgen
