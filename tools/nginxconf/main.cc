// tavow3-nginxconf: runs one operator of the web-server configuration manager.
//
//   tavow3-nginxconf OP [ARG...]
//
// Prints the operator's result lines to standard output as they stand and
// exits with its return code (-1 becomes 255). Arguments after OP go to the
// operator through run_with_args. A missing or non-integer OP is a usage
// error: a message on standard error and exit status 2.
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

#include <tavow3/nginx_conf_manager.h>

namespace {

constexpr char kUsage[] = "usage: tavow3-nginxconf OP [ARG...]   (--help lists the operators)\n";

constexpr char kHelp[] =
    "usage: tavow3-nginxconf OP [ARG...]\n"
    "\n"
    "Runs operator OP of the web server's configuration manager, prints its\n"
    "result lines and exits with its return code (-1 as 255). ARGs, when given,\n"
    "go to the operator (only 8 takes any).\n"
    "\n"
    "  0  deploy at start-up: generate, then Normal or Default   exit 0 or 2\n"
    "  1  deploy on reload: Normal, else Abnormal                exit 0, 1 or 2\n"
    "  2  generate tavow3.sc, certificates and nginx config      exit 0\n"
    "  3  generate tavow3.sc                                     exit 0\n"
    "  4  generate and test the temporary nginx config           exit 0\n"
    "  5  show the recorded mode (0 Normal, 1 Abnormal, 2 Default)\n"
    "  6  force the Default mode at every start-up               exit 0\n"
    "  7  tell whether the Default mode is forced                exit 1 if forced\n"
    "  8  ADDRESS...  set the relay servers' trusted-proxy list  exit 0\n"
    "  9  clear the trusted-proxy list                           exit 0\n"
    " 10  list the trusted-proxy list                            exit 0\n"
    "\n"
    "Failures exit with 255 and are logged to syslog.\n";

// A whole decimal integer that fits an int.
bool ParseOperator(const char* text, int* op) {
  errno = 0;
  char* end = nullptr;
  const long value = std::strtol(text, &end, 10);
  if (end == text || *end != '\0' || errno != 0 || value < INT_MIN || value > INT_MAX) {
    return false;
  }
  *op = static_cast<int>(value);
  return true;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc >= 2 && std::string(argv[1]) == "--help") {
    std::fputs(kHelp, stdout);
    return 0;
  }
  int op = 0;
  if (argc < 2 || !ParseOperator(argv[1], &op)) {
    if (argc >= 2) std::fprintf(stderr, "tavow3-nginxconf: OP must be an integer, not \"%s\"\n", argv[1]);
    std::fputs(kUsage, stderr);
    return 2;
  }
  tavow3::NginxConfManager manager(static_cast<NGINXCONF_OPERATOR>(op));
  const int result = argc > 2 ? manager.run_with_args(std::vector<std::string>(argv + 2, argv + argc))
                              : manager.run();
  const std::string msg = manager.GetMsg();
  std::fwrite(msg.data(), 1, msg.size(), stdout);
  if (std::fflush(stdout) != 0) return 255;
  return result & 0xff;
}
