#!/usr/bin/env bash
# The web server: boot in Normal, reload into Abnormal, boot into Default.
set -euo pipefail

source "$(dirname "${BASH_SOURCE[0]}")/../lib/demo-show.sh"

nginx_sh=/usr/tavo/etc/rc.sysv/nginx.sh
broken=/usr/local/etc/nginx/conf.d/broken.conf

echo "Boot: nginx.sh start runs the start-up decision (tavow3-nginxconf 0), which"
echo "generates the configuration (tavonginxgen), tests it, installs the Normal mode"
echo "and records it; nginx then starts from /etc/nginx/nginx.conf."
show_any "$nginx_sh" start
show_any find /etc/nginx -maxdepth 1 -type l -printf '%p -> %l\n'
show_any curl -s http://127.0.0.1:5000/
show_any curl -sk https://127.0.0.1:5001/
show_any curl -s http://127.0.0.1/
show_any tavow3-nginxconf 5

echo
echo "The relay service's trusted proxies, read by nginx through an include:"
show_any tavow3-nginxconf 8 192.0.2.1 fd00::1
show_any cat /var/tmp/nginx/trusted_proxy/vantoro.conf
show_any tavow3-nginxconf 10
show_any tavow3-nginxconf 8 192.0.2.0/24
show_any tavow3-nginxconf 9

echo
echo "A package drops a broken fragment. The reload (tavow3-nginxconf 1, then SIGHUP)"
echo "finds that the full configuration fails its test and installs Abnormal: the"
echo "fragments of conf.d and sites-enabled are dropped, the management ports stay."
printf 'bogus_directive on;\n' >"$broken"
show_any cat "$broken"
show_any "$nginx_sh" reload
show_any tavow3-nginxconf 5
show_any find /etc/nginx -maxdepth 1 -type l -printf '%p -> %l\n'
sleep 1  # nginx replaces its workers after the signal
show_any curl -s http://127.0.0.1:5000/
show_any curl -s --max-time 2 http://127.0.0.1/

echo
echo "A boot with the fragment still broken falls back to Default: nginx runs the"
echo "management-only configuration and the firewall accepts 5000 and 5001."
show_any "$nginx_sh" stop
show_any "$nginx_sh" start
show_any tavow3-nginxconf 5
show_any iptables -S
show_any curl -s http://127.0.0.1:5000/
show_any curl -sk https://127.0.0.1:5001/
show_any curl -s --max-time 2 http://127.0.0.1/

echo
echo "Repaired and booted again: Normal, and the emergency rule is gone."
rm -f "$broken"
show_any "$nginx_sh" stop
show_any "$nginx_sh" start
show_any iptables -S
show_any curl -s http://127.0.0.1/
show_any "$nginx_sh" stop
