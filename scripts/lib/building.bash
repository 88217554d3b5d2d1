# The scripts' way of building: one line of progress, and the first errors if the build fails. Sourced.

# All clones share their objects in ccache, so no clone compiles a source that another one has compiled.
export CCACHE_BASEDIR=${CCACHE_BASEDIR:-$PWD} CCACHE_NOHASHDIR=${CCACHE_NOHASHDIR:-1}

# first_errors LOG: the messages of the first failed steps of a build, without the compilers' long command lines.
first_errors() {
  awk '
    /^FAILED: / { failed = 1; count++; if (count <= 3) print; command = 1; next }
    command { command = 0; next }
    /^\[[0-9]+\/[0-9]+\] / { failed = 0 }
    failed && count <= 3 && lines < 60 { print; lines++ }
  ' "$1" > "$1.errors"
  # The build may have ended before the first step, or without a failed step in the log.
  if [ -s "$1.errors" ]; then cat "$1.errors"; else grep -m 20 -iE -A 5 'error' "$1" || tail -n 20 "$1"; fi
  rm -f "$1.errors"
}

# last_step LOG: the progress of a build, in ninja's own words.
last_step() { grep -aE '^\[[0-9]+/[0-9]+\] ' "$1" 2> /dev/null | tail -n 1; }

# watch_build LOG: shows the last step of a build: on a terminal in place, elsewhere once a minute. Runs until its input
# ends. (A signal would make bash run the traps of the calling script.)
watch_build() {
  local step shown='' seconds=0 columns
  if [ -t 1 ]; then
    columns=$(tput cols 2> /dev/null || echo 80)
    while goes_on 0.3; do
      step=$(last_step "$1")
      [ "$step" = "$shown" ] || printf '\r\033[K%s' "${step:0:$((columns - 1))}"
      shown=$step
    done
  else
    while goes_on 1; do
      seconds=$((seconds + 1))
      [ $((seconds % 60)) -eq 0 ] || continue
      step=$(last_step "$1")
      echo "   ${step:-configuring}"
    done
  fi
}

# goes_on SECONDS: waits for this time, and fails as soon as the input ends.
goes_on() {
  local code=0
  read -r -t "$1" || code=$?
  [ $code -gt 128 ]
}

# build_preset PRESET [OPTION...] [TARGET...]: configures, with cmake's options that begin with -D, and builds. The
# whole output is in build/PRESET/build.log. On failure it prints the first errors and the log's name, and returns 1.
build_preset() {
  local preset=$1 log=build/$1/build.log building watcher status=0 options=()
  shift
  while [[ ${1:-} == -D* ]]; do options+=("$1") && shift; done
  mkdir -p "build/$preset"
  : > "$log"
  exec {building}> >(watch_build "$log")
  watcher=$!
  { cmake --preset "$preset" "${options[@]}" && cmake --build --preset "$preset" ${1:+--target "$@"}; } \
    > "$log" 2>&1 {building}>&- || status=1
  exec {building}>&-
  wait $watcher 2> /dev/null || true
  [ ! -t 1 ] || printf '\r\033[K'
  [ $status -ne 0 ] || return 0
  echo "The build failed. The first errors:"
  first_errors "$log"
  echo "The whole output is in $log."
  return 1
}
