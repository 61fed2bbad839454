#!/usr/bin/env bash
# The management interface: a management tool moves its HTTPS port.
set -euo pipefail

source "$(dirname "${BASH_SOURCE[0]}")/../lib/demo-show.sh"

# Shows the command, then polls it (up to 5 s) until it succeeds: nginx
# replaces its workers shortly after the reload signal.
show_soon() {
  printf '\n$ %s\n' "$*"
  local tries=50
  until "$@" 2>/dev/null; do
    tries=$((tries - 1))
    if ((tries == 0)); then
      echo "(no answer)"
      return 0
    fi
    sleep 0.1
  done
}

# Shows curl on URL once nginx no longer answers there (up to 5 s), with
# curl's own error message.
show_refused_soon() {
  printf '\n$ curl -sSk %s\n' "$1"
  local tries=50
  while curl -sk --max-time 1 -o /dev/null "$1"; do
    tries=$((tries - 1))
    ((tries > 0)) || break
    sleep 0.1
  done
  curl -sSk --max-time 1 "$1" || echo "(exit status $?)"
}

nginx_sh=/usr/tavo/etc/rc.sysv/nginx.sh

# Earlier steps leave a broken fragment and a web-service setting that nginx
# refuses (and so the Default mode) behind: this step starts from a clean boot.
rm -f /usr/local/etc/nginx/conf.d/broken.conf /usr/tavo/etc/www/WWWService.json
"$nginx_sh" stop
show_any "$nginx_sh" start
show_any tavow3-nginxconf 5
show_any tavow3-zam show
show_any curl -sk https://127.0.0.1:5001/

echo
echo "The tool asks for HTTPS port 6001 (SetHttpsPort with a PortValidator) and"
echo "applies it (Set): the engine registers the port, the configuration is"
echo "generated from the staged /var/tmp/nginx/ZAM.json and tested by nginx, the"
echo "file installed, nginx reloaded and the firewall told."
show_any tavow3-zam set-https-port 6001
show_soon curl -sfk https://127.0.0.1:6001/
show_refused_soon https://127.0.0.1:5001/
show_any cat /usr/tavo/etc/www/ZAM.json
echo
echo "The firewall service file declares the new port:"
show_any grep -A6 '^\[zma_https\]' /usr/tavo/etc/services.d/tavow3.sc

echo
echo "Ports the engine refuses change nothing: 443 belongs to HTTPS of any host,"
echo "and 5000 is the interface's own HTTP port."
show_any tavow3-zam set-https-port 443
show_any tavow3-zam set-https-port 5000
show_any tavow3-zam show
show_any "$nginx_sh" stop
