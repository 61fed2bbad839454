# The 32-bit x86 Debian root in which tools/test-all builds and tests the
# i386 configuration. Sourced (bash) after tools/lib/install-deps.sh.
#
# The root is made once with debootstrap and kept; it is refreshed when the
# package list or the mirrors change (its stamp). Mounts are made inside the
# caller's mount namespace and removed again by tavow3_i386_unmount.

TAVOW3_I386_ROOT=${TAVOW3_I386_ROOT:-/var/tmp/tavow3-i386-root}
# Serialises changes to the root between concurrent runs; builds hold it shared.
TAVOW3_I386_LOCK=${TAVOW3_I386_ROOT}.lock
# Bump when the way the root is made changes.
TAVOW3_I386_RECIPE=1

# Prints the Debian mirror and the security mirror named in this machine's
# apt sources for bookworm, one per line, or the public defaults.
tavow3_debian_mirrors() {
  local main="" security="" deb822=/etc/apt/sources.list.d/debian.sources line
  if [[ -r $deb822 ]]; then
    while read -r line; do
      case $line in
        "bookworm "*) [[ -z $main ]] && main=${line#* } ;;
        "bookworm-security "*) [[ -z $security ]] && security=${line#* } ;;
      esac
    done < <(awk '
      function flush(  n, i, s, u) {
        if (uris != "" && types ~ /(^| )deb( |$)/ && !disabled) {
          split(uris, u, " "); n = split(suites, s, " ")
          for (i = 1; i <= n; i++) print s[i], u[1]
        }
        uris = ""; suites = ""; types = ""; disabled = 0
      }
      /^[ \t]*$/ { flush(); next }
      /^#/ { next }
      /^URIs:/ { sub(/^URIs:[ \t]*/, ""); uris = $0 }
      /^Suites:/ { sub(/^Suites:[ \t]*/, ""); suites = $0 }
      /^Types:/ { sub(/^Types:[ \t]*/, ""); types = $0 }
      /^Enabled:[ \t]*[Nn][Oo]/ { disabled = 1 }
      END { flush() }' "$deb822")
  fi
  local list
  for list in /etc/apt/sources.list /etc/apt/sources.list.d/*.list; do
    [[ -r $list ]] || continue
    while read -r line; do
      case $line in
        "bookworm "*) [[ -z $main ]] && main=${line#* } ;;
        "bookworm-security "*) [[ -z $security ]] && security=${line#* } ;;
      esac
    done < <(awk '$1 == "deb" {
        i = 2
        if ($i ~ /^\[/) { while (i < NF && $i !~ /\]$/) i++; i++ }
        print $(i + 1), $i }' "$list")
  done
  [[ $main == http://* || $main == https://* ]] || main=http://deb.debian.org/debian
  [[ $security == http://* || $security == https://* ]] ||
    security=http://deb.debian.org/debian-security
  printf '%s\n%s\n' "$main" "$security"
}

# The packages of the root: what builds and runs the tests.
tavow3_i386_packages() {
  printf '%s\n' "${TAVOW3_BUILD_PACKAGES[@]}" "${TAVOW3_RUNTIME_PACKAGES[@]}"
}

# The stamp of a root made from the current package list and mirrors.
tavow3_i386_stamp() {
  { echo "recipe $TAVOW3_I386_RECIPE"; tavow3_debian_mirrors; tavow3_i386_packages; } |
    sha256sum | cut -d' ' -f1
}

# Lists the mount points at or below the root, deepest first.
tavow3_i386_mounts() {
  findmnt -rn -o TARGET | awk -v root="$TAVOW3_I386_ROOT" \
    'index($0, root) == 1 && (length($0) == length(root) || substr($0, length(root) + 1, 1) == "/")' |
    sort -r
}

# Removes every mount at or below the root (lazily when one is busy).
tavow3_i386_unmount() {
  local target
  while read -r target; do
    [[ -n $target ]] || continue
    umount "$target" 2>/dev/null || umount -l "$target" || true
  done < <(tavow3_i386_mounts)
}

# Mounts the root onto itself (so it is a mount point, as pivot_root wants),
# /proc, /sys, /dev, /dev/pts, /dev/shm, and the repository `$1` at its own path.
tavow3_i386_mount() {
  local root=$TAVOW3_I386_ROOT repo=$1
  mount --bind "$root" "$root" &&
    mount --make-private "$root" &&
    mount -t proc proc "$root/proc" &&
    mount --bind /sys "$root/sys" &&
    mount --bind /dev "$root/dev" &&
    mount --bind /dev/pts "$root/dev/pts" &&
    { ! mountpoint -q /dev/shm || mount --bind /dev/shm "$root/dev/shm"; } &&
    mkdir -p "$root$repo" &&
    mount --bind "$repo" "$root$repo"
}

# Runs "$@" as root inside the 32-bit root with a clean environment.
tavow3_i386_run() {
  linux32 chroot "$TAVOW3_I386_ROOT" /usr/bin/env -i \
    PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin \
    HOME=/root LANG=C.UTF-8 TERM=dumb DEBIAN_FRONTEND=noninteractive "$@"
}

# Makes the base system with debootstrap and points apt at the mirrors,
# including security and point-release updates, so versions match the host's.
tavow3_i386_bootstrap() {
  local root=$TAVOW3_I386_ROOT main security
  { read -r main; read -r security; } < <(tavow3_debian_mirrors)
  if [[ -n $(tavow3_i386_mounts) ]]; then
    echo "i386: $root still has mounts; not removing it" >&2
    return 1
  fi
  rm -rf --one-file-system "$root"
  echo "i386: debootstrap bookworm from $main"
  debootstrap --arch=i386 --variant=minbase bookworm "$root" "$main" >"$root.debootstrap.log" 2>&1 || {
    tail -n 30 "$root.debootstrap.log" >&2
    return 1
  }
  cat >"$root/etc/apt/sources.list" <<EOF
deb $main bookworm main
deb $main bookworm-updates main
deb $security bookworm-security main
EOF
  # Services installed into the root are never started there.
  printf '#!/bin/sh\nexit 101\n' >"$root/usr/sbin/policy-rc.d"
  chmod 0755 "$root/usr/sbin/policy-rc.d"
  printf 'APT::Install-Recommends "false";\nAPT::Install-Suggests "false";\nAcquire::Languages "none";\nAcquire::Retries "3";\n' \
    >"$root/etc/apt/apt.conf.d/90tavow3"
  printf 'path-exclude=/usr/share/doc/*\npath-exclude=/usr/share/man/*\npath-exclude=/usr/share/locale/*\n' \
    >"$root/etc/dpkg/dpkg.cfg.d/90tavow3-nodoc"
  touch "$root/.tavow3-base"
}

# Updates the root's package indexes, retrying while a mirror is mid-sync.
# When only some indexes stay unavailable (such as the security suite's) it
# goes on with the others and says so; the root then may lag the host.
tavow3_i386_apt_update() {
  local attempt
  for attempt in 1 2 3; do
    tavow3_i386_run apt-get update -q && return 0
    [[ $attempt -lt 3 ]] && sleep 10
  done
  if compgen -G "$TAVOW3_I386_ROOT/var/lib/apt/lists/*_dists_bookworm_main_binary-i386_Packages*" \
    >/dev/null; then
    echo "i386: warning: some package indexes are unavailable; using the others" >&2
    return 0
  fi
  return 1
}

# Installs the package list into the mounted root and records its stamp.
tavow3_i386_install() {
  local root=$TAVOW3_I386_ROOT
  cp -L /etc/resolv.conf "$root/etc/resolv.conf" 2>/dev/null || true
  # shellcheck disable=SC2046  # one word per package
  tavow3_i386_apt_update &&
    tavow3_i386_run apt-get install -y -q --no-install-recommends $(tavow3_i386_packages) &&
    tavow3_i386_run apt-get -q dist-upgrade -y &&
    tavow3_i386_run apt-get clean || return 1
  tavow3_i386_stamp >"$root/.tavow3-stamp"
}

# Makes the root ready for the repository `$1` and mounts it: bootstraps it
# when missing, installs packages when its stamp is stale. Call it inside a
# private mount namespace, holding nothing on TAVOW3_I386_LOCK; it returns
# holding the lock shared on descriptor 9.
tavow3_i386_prepare() {
  local root=$TAVOW3_I386_ROOT repo=$1 stamp
  stamp=$(tavow3_i386_stamp)
  exec 9>"$TAVOW3_I386_LOCK"
  flock -x 9
  if [[ ! -f $root/.tavow3-base ]]; then
    tavow3_i386_bootstrap || return 1
  fi
  tavow3_i386_mount "$repo" || return 1
  if [[ $(cat "$root/.tavow3-stamp" 2>/dev/null) != "$stamp" ]]; then
    echo "i386: installing the build and runtime packages into $root"
    tavow3_i386_install || return 1
  else
    echo "i386: reusing $root (stamp ${stamp:0:12})"
  fi
  flock -s 9
}
