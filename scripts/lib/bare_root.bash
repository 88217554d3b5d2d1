# Bare Debian systems in folders, for scripts/check-platforms. Sourced; the folder $cache is kept.
#
# Every command in a root runs in its own mount and process namespaces. So at its end the kernel undoes every mount,
# with its loop device, and ends every process, even if this script is killed.

: "${cache:?}"
running=

# bounded SECONDS COMMAND...: runs a command in its own process group, and ends the group after that time. Returns its
# status, or 137 after a timeout.
bounded() {
  local status=0
  setsid timeout --signal=KILL "$@" < /dev/null &
  running=$!
  { wait $running; } 2> /dev/null || status=$?  # the shell would report that it was killed
  running=
  return $status
}

# end_running: ends the running command.
end_running() { [ -z "$running" ] || kill -KILL -- "-$running" 2> /dev/null || true; }

# debian_name NUMBER: the archive's name for a version of Debian.
debian_name() { case $1 in 12) echo bookworm ;; 13) echo trixie ;; esac; }

# mirror_of LABEL: the place from which this system's apt reads Debian, or Debian-Security.
mirror_of() {
  # shellcheck disable=SC2016  # apt's own variables
  apt-get indextargets --format '$(ORIGIN) $(LABEL) $(REPO_URI)' 'Created-By: Packages' 2> /dev/null |
    awk -v label="$1" '$1 == "Debian" && $2 == label { print $3; exit }'
}

# make_bare NUMBER MIRROR SECURITY: $cache/debian-NUMBER.tar, a system with only apt, git and certificates.
make_bare() {
  local number=$1 mirror=$2 security=$3 name made status=0
  name=$(debian_name "$number")
  made=$cache/making.$$
  mkdir -p "$made" "$cache/packages-$number"
  # debootstrap mounts file systems in the folder, so it also has its own namespaces.
  bounded 1800 unshare --mount --propagation private --pid --fork --kill-child \
    debootstrap --variant=minbase --include=ca-certificates,git --cache-dir="$cache/packages-$number" \
    "$name" "$made" "$mirror" > "$cache/logs/debootstrap-$number.log" 2>&1 || status=$?
  if [ $status -eq 0 ]; then
    {
      echo "deb $mirror $name main"
      echo "deb $mirror $name-updates main"
      [ -z "$security" ] || echo "deb $security $name-security main"
    } > "$made/etc/apt/sources.list"
    rm -f "$made"/etc/hostname "$made"/etc/resolv.conf "$made"/var/cache/apt/archives/*.deb
    tar --create --file="$cache/debian-$number.tar.new" --directory="$made" --numeric-owner . || status=$?
  fi
  rm -rf --one-file-system "$made"
  [ $status -eq 0 ] || { tail -n 20 "$cache/logs/debootstrap-$number.log" >&2; return 1; }
  mv "$cache/debian-$number.tar.new" "$cache/debian-$number.tar"
}

# unpack_bare NUMBER ROOT: a fresh system in a folder, with this system's network settings.
unpack_bare() {
  mkdir -p "$2/etc/dpkg/dpkg.cfg.d"
  tar --extract --file="$cache/debian-$1.tar" --directory="$2" --numeric-owner --same-permissions || return 1
  cp /etc/resolv.conf "$2/etc/resolv.conf"
  echo force-unsafe-io > "$2/etc/dpkg/dpkg.cfg.d/no-sync"  # the system is temporary, and waiting for disks takes minutes
  mkdir -p "$2/var/cache/pinwell-objects"
}

# in_root NUMBER ROOT SECONDS COMMAND...: runs a command as the superuser of a root, with the environment of a bare
# system. $objects, if set, is the folder of a compiler cache.
in_root() {
  local number=$1 root=$2 seconds=$3
  shift 3
  # shellcheck disable=SC2016  # for the shell inside
  bounded "$seconds" unshare --mount --propagation private --pid --fork --kill-child bash -c '
    set -e
    root=$1 packages=$2 objects=$3
    shift 3
    mount --bind "$root" "$root"
    mount -t proc proc "$root/proc"
    mount --rbind /sys "$root/sys"
    mount --rbind /dev "$root/dev"
    mount --bind "$packages" "$root/var/cache/apt/archives"
    [ -z "$objects" ] || mount --bind "$objects" "$root/var/cache/pinwell-objects"
    # In a root by chroot alone, the kernel lets no program make its own name spaces.
    cd "$root"
    pivot_root . mnt
    exec chroot . env -i PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin HOME=/root TERM=dumb \
      ${objects:+CCACHE_DIR=/var/cache/pinwell-objects} bash -c "umount --lazy /mnt && cd /root/pinwell && exec \"\$@\"" in-root "$@"
  ' in-root "$root" "$cache/packages-$number" "${objects:-}" "$@"
}
