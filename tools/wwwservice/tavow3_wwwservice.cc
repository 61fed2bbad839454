// tavow3-wwwservice: the general web service's settings on the command line.
//
//   tavow3-wwwservice show   prints the settings read from its stored file
//   tavow3-wwwservice set    saves them: the web server's configuration is
//                            regenerated and tested, the file installed, nginx
//                            reloaded and the firewall told
//
// The service has no setters: an administrator edits
// /usr/tavo/etc/www/WWWService.json and applies it with `set`. Exit status 0
// on success, 1 on failure, 2 for wrong arguments.
#include <cstdio>
#include <cstring>

#include <tavow3/tavow3.h>

namespace {

void Show(const tavow3::WWWService& www) {
  std::printf("settings read: %s\n", www.OK() ? "yes" : "no (defaults)");
  std::printf("additional HTTP port:  %u\n", www.GetHttpAddPort());
  std::printf("additional HTTPS port: %u\n", www.GetHttpsAddPort());
  std::printf("certificate: %s\nkey: %s\n", www.GetCERT().c_str(), www.GetKEY().c_str());
  std::printf("HTTP/2 (SPDY): %s\nHSTS: %s\n", www.GetEnableSPDY() ? "on" : "off",
              www.GetEnableHSTS() ? "on" : "off");
}

}  // namespace

int main(int argc, char** argv) {
  if (argc != 2 || (std::strcmp(argv[1], "show") != 0 && std::strcmp(argv[1], "set") != 0)) {
    std::fputs("usage: tavow3-wwwservice show|set\n", stderr);
    return 2;
  }
  tavow3::Engine engine;
  tavow3::WWWService www(engine);
  if (std::strcmp(argv[1], "show") == 0) {
    Show(www);
    return 0;
  }
  if (!www.Set()) {
    std::fputs("tavow3-wwwservice: the settings were not applied (see the system log)\n", stderr);
    return 1;
  }
  std::puts("settings applied");
  return 0;
}
