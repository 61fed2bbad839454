# Debian packages the project needs, and their installer. Sourced by
# tools/test-all and tools/demo (bash).

# Building libtavow3, its tests and its programs.
TAVOW3_BUILD_PACKAGES=(
  cmake g++ make pkg-config
  libboost-dev libjsoncpp-dev libpcre2-dev libicu-dev
  libgtest-dev libgmock-dev libkainjow-mustache-dev
)
# What a sandboxed appliance runs: the web server, the firewall, namespaces,
# overlay mounts, chattr, certificates.
TAVOW3_RUNTIME_PACKAGES=(
  nginx-light libnginx-mod-http-headers-more-filter
  iptables iproute2 curl util-linux procps psmisc e2fsprogs
  openssl ca-certificates python3
)
# Only on the build machine: benchmarks and the 32-bit x86 root.
TAVOW3_HOST_PACKAGES=(libbenchmark-dev debootstrap)

# Prints the packages of "$@" that dpkg does not list as installed. With
# TAVOW3_DPKG_ROOT set, looks inside that root file system instead.
tavow3_missing_packages() {
  local admin=() package status
  if [[ -n ${TAVOW3_DPKG_ROOT:-} ]]; then
    admin=(--admindir="$TAVOW3_DPKG_ROOT/var/lib/dpkg")
  fi
  for package in "$@"; do
    status=$(dpkg-query "${admin[@]}" -W -f='${db:Status-Abbrev}' "$package" 2>/dev/null || true)
    [[ $status == ii* ]] || printf '%s\n' "$package"
  done
}

# Installs "$@" with apt-get unless all of them are installed already.
# Services that the packages bring (nginx) are not started on this machine.
tavow3_install_packages() {
  local missing
  missing=$(tavow3_missing_packages "$@")
  if [[ -z $missing ]]; then
    echo "install-deps: all $# packages present"
    return 0
  fi
  echo "install-deps: installing" $missing
  if [[ $(id -u) -ne 0 ]]; then
    echo "install-deps: missing packages and not root: run as root (sudo)" >&2
    return 1
  fi
  local policy=/usr/sbin/policy-rc.d made_policy=0
  if [[ ! -e $policy ]]; then
    printf '#!/bin/sh\nexit 101\n' >"$policy"
    chmod 0755 "$policy"
    made_policy=1
  fi
  local status=0
  DEBIAN_FRONTEND=noninteractive apt-get update -q || status=$?
  if [[ $status -eq 0 ]]; then
    # shellcheck disable=SC2086  # one word per package
    DEBIAN_FRONTEND=noninteractive apt-get install -y -q --no-install-recommends $missing ||
      status=$?
  fi
  [[ $made_policy -eq 1 ]] && rm -f "$policy"
  return "$status"
}

# Everything the build machine needs.
tavow3_install_host_deps() {
  tavow3_install_packages "${TAVOW3_BUILD_PACKAGES[@]}" "${TAVOW3_RUNTIME_PACKAGES[@]}" \
    "${TAVOW3_HOST_PACKAGES[@]}"
}
