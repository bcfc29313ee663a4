# A fresh Debian in a folder, for the scripts that need one. Sourced after lib.sh, never run.

# make_fresh_base [SUITE]: debootstraps the system once (default: Debian 12), from the mirror that
# this machine uses; it is copied for every use.
make_fresh_base() {
  local suite=${1:-bookworm} mirror
  need_root
  fresh_base=$root/build/fresh/base-$suite
  [ ! -e "$fresh_base/.complete" ] || return 0
  command -v debootstrap >/dev/null || apt-get install -y --no-install-recommends debootstrap >/dev/null ||
    die "needs debootstrap"
  rm -rf "$fresh_base"
  mkdir -p "$fresh_base"
  mirror=$(sed -nE 's/^URIs: *([^ ]+).*/\1/p; s/^deb +(\[[^]]*\] *)?([^ ]+).*/\2/p' \
    /etc/apt/sources.list /etc/apt/sources.list.d/*.sources 2>/dev/null | head -n 1) || true
  say "a fresh $suite: about 100 MB to download, 400 MB on disk, 2 minutes"
  quietly "debootstrap of $suite" \
    debootstrap --merged-usr --variant=minbase "$suite" "$fresh_base" $mirror ||
    die "debootstrap failed: does the mirror $mirror carry $suite?"
  # A minimal system has no updates and security suites; a fresh installation has.
  if [ "$suite" = "$(. /etc/os-release && echo "${VERSION_CODENAME:-}")" ] && cp /etc/apt/sources.list.d/debian.sources \
    "$fresh_base/etc/apt/sources.list.d/" 2>/dev/null; then
    : >"$fresh_base/etc/apt/sources.list"
  fi
  rm -rf "$fresh_base"/var/cache/apt/archives/*.deb
  touch "$fresh_base/.complete"
}

# fresh_copy FOLDER: a copy of it, which can reach the package mirror.
fresh_copy() {
  rm -rf "$1"
  cp -a "$fresh_base" "$1"
  cp /etc/resolv.conf "$1/etc/resolv.conf"
}

# in_fresh FOLDER COMMAND...: runs a command in there, in private namespaces.
in_fresh() {
  unshare --mount --pid --fork --kill-child --propagation private -- sh -c '
    mount --bind "$1" "$1" && cd "$1" &&
    mount -t proc proc proc && mount --rbind /dev dev && mount -t sysfs sysfs sys &&
    shift && exec chroot . /usr/bin/env -i HOME=/root PATH=/usr/sbin:/usr/bin:/sbin:/bin \
      TERM=dumb DEBIAN_FRONTEND=noninteractive "$@"' sh "$@"
}
