// tavow3-zam: the management interface's settings on the command line.
//
//   tavow3-zam show                 prints the settings read from its stored file
//   tavow3-zam set-http-port PORT   moves the HTTP port and applies (Set())
//   tavow3-zam set-https-port PORT  moves the HTTPS port and applies (Set())
//
// A port setter asks the engine first: a port that another service registered
// or that a process other than nginx listens on is refused and nothing
// changes. Applying regenerates and tests the web server's configuration,
// installs the settings file, reloads nginx and tells the firewall. Exit
// status 0 on success, 1 when refused or not applied, 2 for wrong arguments.
#include <tavow3/tavow3.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

namespace {

constexpr char kUsage[] = "usage: tavow3-zam show | set-http-port PORT | set-https-port PORT\n";

const char* OnOff(bool on) { return on ? "on" : "off"; }

void Show(const tavow3::ZAM& zam) {
  std::printf("settings read: %s\n", zam.OK() ? "yes" : "no (defaults)");
  std::printf("HTTP port:  %u\nHTTPS port: %u\n", zam.GetHttpPort(), zam.GetHttpsPort());
  std::printf("redirect to HTTPS: %s\nHSTS: %s\nHTTP/2 (SPDY): %s\ncompression: %s\n",
              OnOff(zam.GetEnableHttpsRedirect()), OnOff(zam.getHSTS()), OnOff(zam.GetEnableSPDY()),
              OnOff(zam.getHTTPCompression()));
  const std::string fqdn = zam.getFQDN();
  std::printf("custom domain: %s\n", fqdn.empty() ? "(none)" : fqdn.c_str());
  std::printf("connections: %d (%d to %d)\n", zam.GetMaxConnections(),
              zam.GetLowerLimitMaxConnections(), zam.GetUpperLimitMaxConnections());
  std::printf("TLS profile: %d\n", zam.getTLSProfile());
  std::printf("server header: %s\n",
              zam.GetEnableServerHeader() ? zam.GetServerHeader().c_str() : "(none)");
}

// The port argument: 1 to 65535, else 0, which every setter refuses.
unsigned short ParsePort(const char* text) {
  char* end = nullptr;
  errno = 0;
  const long port = std::strtol(text, &end, 10);
  if (errno != 0 || end == text || *end != '\0' || port < 1 || port > 65535) return 0;
  return static_cast<unsigned short>(port);
}

}  // namespace

int main(int argc, char** argv) {
  const std::string command = argc >= 2 ? argv[1] : "";
  const bool is_show = command == "show" && argc == 2;
  const bool is_port = (command == "set-http-port" || command == "set-https-port") && argc == 3;
  if (!is_show && !is_port) {
    std::fputs(kUsage, stderr);
    return 2;
  }
  tavow3::Engine engine;
  tavow3::ZAM zam(engine);
  if (is_show) {
    Show(zam);
    return 0;
  }
  const tavow3::PortValidator requested(ParsePort(argv[2]));
  const bool taken =
      command == "set-http-port" ? zam.SetHttpPort(requested) : zam.SetHttpsPort(requested);
  if (!taken) {
    std::fprintf(stderr, "tavow3-zam: port %s refused\n", argv[2]);
    return 1;
  }
  if (!zam.Set()) {
    std::fputs("tavow3-zam: the settings were not applied (see the system log)\n", stderr);
    return 1;
  }
  std::printf("port %u applied\n", requested.port());
  return 0;
}
