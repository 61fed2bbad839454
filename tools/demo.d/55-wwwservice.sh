#!/usr/bin/env bash
# The general web service: an additional port from its settings file to nginx.
set -euo pipefail

source "$(dirname "${BASH_SOURCE[0]}")/../lib/demo-show.sh"

nginx_sh=/usr/tavo/etc/rc.sysv/nginx.sh
stored=/usr/tavo/etc/www/WWWService.json

show_any "$nginx_sh" start
echo
echo "Port 8081 is not served yet:"
show_any curl -s --max-time 2 http://127.0.0.1:8081/

echo
echo "The administrator adds an additional HTTP port to the stored settings and"
echo "applies them: the configuration is regenerated from the staged copy and"
echo "tested by nginx, the file installed, nginx reloaded, the firewall told."
mkdir -p "${stored%/*}"
printf '{ "version": 1, "additionalPort": { "http": 8081 } }\n' >"$stored"
show_any cat "$stored"
show_any tavow3-wwwservice set
show_any tavow3-wwwservice show
sleep 1  # nginx replaces its workers after the signal
show_any curl -s http://127.0.0.1:8081/
echo
echo "The firewall service file now declares the port:"
show_any cat /usr/tavo/etc/services.d/tavow3.sc

echo
echo "A setting nginx refuses (a certificate that does not exist) is not applied:"
printf '{ "version": 1, "additionalPort": { "http": 8082, "https": 8443 }, "ssl": { "certificate": "/nowhere.crt" } }\n' >"$stored"
show_any tavow3-wwwservice set
show_any curl -s --max-time 2 http://127.0.0.1:8082/
show_any curl -s http://127.0.0.1:8081/
show_any "$nginx_sh" stop

echo
echo "The administrator reverts the file; the next steps start from the defaults."
rm -f "$stored"
