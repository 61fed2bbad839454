// tavonginxgen: generates the web server's configuration for the appliance.
//
//   tavonginxgen               the certificate when missing, then every file
//   tavonginxgen --certificate only the certificate when missing
//
// The appliance's generator script /usr/tavo/etc/rc.sysv/nginx-conf-generator.sh
// runs it; the library then tests and installs what it wrote. Exit status 0
// on success, 1 on a failure (message on standard error), 2 for wrong
// arguments.
#include <cstdio>
#include <string>

#include "certificate.h"
#include "generator.h"
#include "settings.h"

namespace {

constexpr char kUsage[] = "usage: tavonginxgen [--certificate]\n";

int Fail(const std::string& error) {
  std::fprintf(stderr, "tavonginxgen: %s\n", error.c_str());
  return 1;
}

}  // namespace

int main(int argc, char** argv) {
  const std::string option = argc == 2 ? argv[1] : "";
  if (argc > 2 || (argc == 2 && option != "--certificate")) {
    std::fputs(kUsage, stderr);
    return 2;
  }
  std::string error;
  if (!tavonginxgen::EnsureCertificate(&error)) return Fail(error);
  if (option == "--certificate") return 0;
  if (!tavonginxgen::Generate(tavonginxgen::LoadSettings(), tavonginxgen::kTemplateDir, &error)) {
    return Fail(error);
  }
  return 0;
}
