# Shared code of the tests of checks. They put faults into a copy of the checked files, and the check must name each fault.
# Sourced, after `set -euo pipefail`; makes the folder for the copy, and removes it at the end.

# shellcheck source=outcomes.bash
. "$(dirname "${BASH_SOURCE[0]}")/outcomes.bash"

copy=$(mktemp -d)
trap 'rm -rf "$copy"' EXIT
complaints=()

# spoil FILE EDIT COMPLAINT: edits a file of the copy, and records the expected complaint.
spoil() {
  local before
  before=$(cat "$copy/$1")
  sed -i -E "$2" "$copy/$1"
  [ "$before" != "$(cat "$copy/$1")" ] || fail "$1: nothing to edit by $2"
  complaints+=("$3")
}

# expect_success COMMAND...: the check finds no fault in the present copy.
expect_success() {
  local said
  said=$("$@" 2>&1) || fail "complains without a cause: $said"
}

# expect_complaints COMMAND...: the check ends with 1, and with every complaint recorded since its last call.
expect_complaints() {
  local status=0 said complaint
  [ ${#complaints[@]} -gt 0 ] || fail "nothing has been spoilt"
  said=$("$@" 2>&1) || status=$?
  [ $status -eq 1 ] || fail "exit status $status: $said"
  for complaint in "${complaints[@]}"; do
    grep -qF -- "$complaint" <<< "$said" || fail "\"$complaint\" is not said in: $said"
  done
  complaints=()
}

# stand_in FILE LINE...: a shell script in the copy that replaces a program.
stand_in() {
  mkdir -p "$(dirname "$copy/$1")"
  printf '%s\n' '#!/bin/sh' "${@:2}" > "$copy/$1"
  chmod +x "$copy/$1"
}
