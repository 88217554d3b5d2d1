# Shared code of the tests in this folder. Sourced, after `set -euo pipefail`.

# shellcheck source=../support/outcomes.bash
. "$(dirname "${BASH_SOURCE[0]}")/../support/outcomes.bash"

# The long and short options in a program's help, one a line. They are on the left of the table of options.
options_in_help() {
  sed -nE 's/^ +((-[a-z0-9],)?--[a-z-]+).*/\1/p' | tr , '\n' | sort -u
}

# The subcommands in a program's help, one a line.
subcommands_in_help() {
  sed -n '/^Subcommands:/,$p' | sed -nE 's/^  ([a-z][a-z-]*) .*/\1/p'
}

# same WHAT EXPECTED GOT: two lists of one entry a line are equal and not empty.
same() {
  [ -n "$2" ] || fail "$1: none found"
  same_or_none "$@"
}

# same_or_none WHAT EXPECTED GOT: the same, but both may be empty.
same_or_none() {
  local difference
  difference=$(diff <(sort -u <<< "$2") <(sort -u <<< "$3")) || fail "$1 (< expected, > found):"$'\n'"$difference"
}
