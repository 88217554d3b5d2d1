# Shared code of the benchmarks. Sets $bin (the optimised programs) and $compare, and makes a directory $work. At the end it
# ends the started programs and removes the written files.
#
#   build TARGET...    builds the programs, optimised
#   start_service      starts a record service and points PINWELL_PLATFORM at it; sets $url
#   forget FILE        drops the file from the page cache
#
# shellcheck disable=SC2034  # the sourcing scripts use these variables
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
bin=$PWD/build/release/bin
compare=$bin/compare_commands
name=bench/$(basename "$0")

work=$(mktemp -d)
service=
cleanup() {
  [ -z "$service" ] || { kill "$service" 2> /dev/null || true; wait "$service" 2> /dev/null || true; }
  ! mountpoint -q "$work/volume" || umount "$work/volume"
  rm -rf "$work"
}
trap cleanup EXIT
export TMPDIR=$work/tmp
mkdir "$TMPDIR"

die() { echo "$name: $1" >&2; exit 69; }

needs() {
  command -v "$1" > /dev/null || die "needs $1 (of the Debian package $2)"
}

build() {
  cmake --preset release > /dev/null
  cmake --build --preset release --target compare_commands "$@" > /dev/null
}

start_service() {
  [ -d "$work/lumora" ] || "$bin/lumora-local" init "$work/lumora" > /dev/null
  "$bin/lumora-local" serve "$work/lumora" --listen 127.0.0.1:0 --update-platform --ready-file "$work/ready" \
    > "$work/log" 2>&1 &
  service=$!
  for _ in $(seq 100); do [ -e "$work/ready" ] && break; sleep 0.1; done
  url=$(cat "$work/ready")
  export PINWELL_PLATFORM=$work/lumora/platform
}

forget() { dd if="$1" iflag=nocache count=0 status=none; }
