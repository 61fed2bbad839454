#!/usr/bin/env bash
# The web server: boot in Normal, reload into Abnormal, boot into Default.
set -euo pipefail

# Shows a command as one would type it, then runs it; a failure shows its
# exit status and the step goes on.
show() {
  local arg line=
  for arg in "$@"; do
    if [[ $arg =~ ^[A-Za-z0-9_./:=,+-]+$ ]]; then
      line+=" $arg"
    else
      line+=" '${arg//\'/\'\\\'\'}'"
    fi
  done
  printf '\n$%s\n' "$line"
  "$@" || echo "(exit status $?)"
}

nginx_sh=/usr/tavo/etc/rc.sysv/nginx.sh
broken=/usr/local/etc/nginx/conf.d/broken.conf

echo "Boot: nginx.sh start runs the start-up decision (tavow3-nginxconf 0), which"
echo "generates the configuration (tavonginxgen), tests it, installs the Normal mode"
echo "and records it; nginx then starts from /etc/nginx/nginx.conf."
show "$nginx_sh" start
show find /etc/nginx -maxdepth 1 -type l -printf '%p -> %l\n'
show curl -s http://127.0.0.1:5000/
show curl -sk https://127.0.0.1:5001/
show curl -s http://127.0.0.1/
show tavow3-nginxconf 5

echo
echo "The relay service's trusted proxies, read by nginx through an include:"
show tavow3-nginxconf 8 192.0.2.1 fd00::1
show cat /var/tmp/nginx/trusted_proxy/vantoro.conf
show tavow3-nginxconf 10
show tavow3-nginxconf 8 192.0.2.0/24
show tavow3-nginxconf 9

echo
echo "A package drops a broken fragment. The reload (tavow3-nginxconf 1, then SIGHUP)"
echo "finds that the full configuration fails its test and installs Abnormal: the"
echo "fragments of conf.d and sites-enabled are dropped, the management ports stay."
printf 'bogus_directive on;\n' >"$broken"
show cat "$broken"
show "$nginx_sh" reload
show tavow3-nginxconf 5
show find /etc/nginx -maxdepth 1 -type l -printf '%p -> %l\n'
sleep 1  # nginx replaces its workers after the signal
show curl -s http://127.0.0.1:5000/
show curl -s --max-time 2 http://127.0.0.1/

echo
echo "A boot with the fragment still broken falls back to Default: nginx runs the"
echo "management-only configuration and the firewall accepts 5000 and 5001."
show "$nginx_sh" stop
show "$nginx_sh" start
show tavow3-nginxconf 5
show iptables -S
show curl -s http://127.0.0.1:5000/
show curl -sk https://127.0.0.1:5001/
show curl -s --max-time 2 http://127.0.0.1/

echo
echo "Repaired and booted again: Normal, and the emergency rule is gone."
rm -f "$broken"
show "$nginx_sh" stop
show "$nginx_sh" start
show iptables -S
show curl -s http://127.0.0.1/
show "$nginx_sh" stop
