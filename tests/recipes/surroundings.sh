# Shared code of the tests of the recipes; sourced with the test's arguments:
#
#   PROGRAMS   the folder of pinwell and lumora-local
#   PAGE       the page with the recipes
#
# The variable RECIPE_SAMPLES names a folder with a sample of every kind.
#
# Makes a temporary directory and changes to it. At the end it ends the service and removes the directory. The directory has
# the recipes' surroundings: release/ with a sample of every kind, and staple-and-validate from the page.
# shellcheck shell=bash
set -euo pipefail
# shellcheck source=../support/outcomes.bash
. "$(dirname "${BASH_SOURCE[0]}")/../support/outcomes.bash"

programs=$1 page=$2
recipes=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
service=
background=  # a process group

work=$(mktemp -d)
clean_up() {
  [ -z "$background" ] || kill -- "-$background" 2> /dev/null || true
  # The order matters for a stopped process.
  if [ -n "$service" ]; then
    kill "$service" 2> /dev/null || true
    kill -CONT "$service" 2> /dev/null || true
    wait "$service" 2> /dev/null || true
  fi
  rm -rf "$work"
}
trap clean_up EXIT
trap 'exit 1' INT TERM HUP

# The recipes get none of the caller's own settings.
unset https_proxy HTTPS_PROXY all_proxy ALL_PROXY PARALLEL PARALLEL_SSH PINWELL_PLATFORM
unset RETRY_ATTEMPTS RETRY_DELAY TIME_LIMIT KILL_AFTER SERVICE_HOST
export LC_ALL=C HOME=$work/home TMPDIR=$work/tmp PATH=$programs:$PATH
mkdir "$HOME" "$TMPDIR"
cd "$work"

expect_equal() { # WHAT WANTED GOT
  [ "$2" = "$3" ] || fail "$1: expected '$2', got '$3'"
}
expect_status() { # STATUS COMMAND...
  local wanted=$1 got=0
  shift
  "$@" || got=$?
  [ "$got" -eq "$wanted" ] || fail "expected exit status $wanted, got $got: $*"
}

# run_recipe NAME...: the blocks, one after another in one shell, which ends at the first command that fails.
run_recipe() {
  local name script
  script=$(mktemp)
  for name in "$@"; do "$recipes/extract" "$page" "recipe: $name" >> "$script" || exit 1; done
  bash -euo pipefail "$script"
}

write_step() {
  "$recipes/extract" "$page" "recipe: staple-and-validate" > staple-and-validate
  chmod +x staple-and-validate
}

# wait_for COMMAND...: waits until the command succeeds; ctest limits the time.
wait_for() {
  until "$@"; do command -p sleep 0.05; done
}

# make_samples FOLDER: copies the samples, which are made once for all tests of the recipes.
make_samples() {
  cp -R "$RECIPE_SAMPLES" "$1"
}

make_service() {
  # Nobody listens on port 1, so the service is unreachable until it starts.
  lumora-local init --host 127.0.0.1 --port 1 service > /dev/null
  make_samples release
  export PINWELL_PLATFORM=$work/service/platform
}

service_listens_or_died() {
  [ -e ready ] || ! kill -0 "$service" 2> /dev/null
}

start_service() {
  lumora-local serve service --listen 127.0.0.1:0 --update-platform --ready-file ready > serve.log 2>&1 &
  service=$!
  wait_for service_listens_or_died
  [ -e ready ] || fail "the service did not start: $(cat serve.log)"
}

lookups() {
  grep -c POST serve.log || true
}
