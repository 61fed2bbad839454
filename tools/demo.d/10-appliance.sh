#!/usr/bin/env bash
# The appliance and its platform layer: programs, firewall module sets, TLS store.
set -euo pipefail

source "$(dirname "${BASH_SOURCE[0]}")/../lib/demo-show.sh"

echo "The sandbox is a throwaway appliance: its own mounts, network and processes."
show find /usr/tavo -maxdepth 3

echo
echo "Programs run by argument vector through the platform (TLIBCExec), no shell:"
show tavo-platform exec /usr/bin/printf '[%s]\n' "two words" "" 'a;b'
show tavo-platform exec /usr/bin/test -d /nonexistent || true
show tavo-platform popen /usr/sbin/nginx -t || true

echo
echo "The firewall module set ZAM_DEFAULT_SERVICE (this sandbox's own iptables):"
show tavo-platform fw-status ZAM_DEFAULT_SERVICE || true
show tavo-platform fw-load ZAM_DEFAULT_SERVICE
show iptables -S
show tavo-platform fw-unload ZAM_DEFAULT_SERVICE
show iptables -S

echo
echo "Firewall service files and port lists:"
sc=/tmp/demo.sc
cat >"$sc" <<'SC'
[ZAM_5000]
title="HTTP"
desc="ZAM"
ports="5000,8000:8010"
protocol="tcp"
SC
show cat "$sc"
show tavo-platform sc-read "$sc"
show tavo-platform port-conflict 5000,8000:8010 80,443,8005
show tavo-platform port-conflict 5000,8000:8010 80,443 || true
rm -f "$sc"

echo
echo "The TLS-profile store:"
show tavo-platform tls-list
show tavo-platform tls-level zam
show tavo-platform tls-level zam 3
show tavo-platform tls-list
