#!/usr/bin/env bash
# The engine: its registry and the ports other processes hold, which it refuses.
set -euo pipefail

source "$(dirname "${BASH_SOURCE[0]}")/../lib/demo-show.sh"

# Waits (up to 10 s) until something listens on TCP port $1.
wait_listening() {
  local hex i
  hex=$(printf ':%04X ' "$1")
  for ((i = 0; i < 100; i++)); do
    if grep -q "$hex[0-9A-F:]* 0A " /proc/net/tcp /proc/net/tcp6 2>/dev/null; then
      return 0
    fi
    sleep 0.1
  done
  echo "demo: nothing listens on port $1" >&2
  return 1
}

listeners=()
cleanup() {
  local pid
  for pid in "${listeners[@]}"; do
    kill "$pid" 2>/dev/null || true
    wait "$pid" 2>/dev/null || true
  done
}
trap cleanup EXIT

# Starts a small web server on loopback address $1, port $2, in the background.
listen() {
  printf '\n$ python3 -m http.server %s --bind %s &\n' "$2" "$1"
  /usr/bin/python3 -m http.server "$2" --bind "$1" --directory /usr/tavo >/dev/null 2>&1 &
  listeners+=($!)
  wait_listening "$2"
}

echo "Two programs that are not the web server take ports 8000 and 8081 (IPv6 only):"
listen 127.0.0.1 8000
listen ::1 8081

echo
echo "A fresh engine, loaded, with the ports other processes hold; then registrations:"
echo "a held port is refused, a free one is taken, and a port keeps its first schema."
show tavow3-engine-info --try 8000 --try 8081/https --try 8082 --try 8082/https@portal.example \
  --try 8082@portal.example

echo
echo "The refusals in the system log:"
show grep -h 'Runtime port' /run/tavow3-sandbox/syslog
