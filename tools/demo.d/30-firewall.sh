#!/usr/bin/env bash
# Firewall service files: the engine's registry rendered by tavomustache.
set -euo pipefail

source "$(dirname "${BASH_SOURCE[0]}")/../lib/demo-show.sh"

installed=/usr/tavo/etc/services.d/tavow3.sc
echo "Regenerate tavow3.sc from the stored settings (TAVOW3_Fw_RegenAll, a C client):"
show tavow3-fwregen
if [[ -f $installed ]]; then
  show cat /var/tmp/tavow3/Firewall.json
  show cat "$installed"
  show tavo-platform sc-read "$installed"
else
  echo "No settings object declares a port of owner tavow3: there is no $installed."
fi

echo
echo "The same template and tool by hand. Quotes and backslashes in a value are"
echo "escaped for the quoted .sc value and come back unchanged when read:"
work=$(mktemp -d)
cat >"$work/Firewall.json" <<'JSON'
{"sections": [
  {"port": 8080, "section": "ReverseProxy_8080", "title": "HTTP", "protocol": "udp,tcp",
   "desc_key": "firewall:desc_http", "desc": "Portal \"Sales\"", "desc_extra": "C:\\web"},
  {"port": 8443, "section": "https_extra", "title": "HTTPS", "title_key": "firewall:opt_https",
   "protocol": "tcp"}
]}
JSON
show cat "$work/Firewall.json"
show tavomustache /usr/tavo/share/nginx/Firewall.mustache "$work/Firewall.json" -o "$work/out.sc"
show cat "$work/out.sc"
show tavo-platform sc-read "$work/out.sc"

echo
echo "A value that no quoted value can carry (a line break) is refused; the old file stays:"
printf '{"sections": [{"port": 1, "section": "s", "title": "HTTP", "desc": "two\\nlines"}]}\n' \
  >"$work/bad.json"
show tavomustache /usr/tavo/share/nginx/Firewall.mustache "$work/bad.json" -o "$work/out.sc" ||
  echo "(exit status $?)"
show tavo-platform sc-read "$work/out.sc"
rm -rf "$work"
