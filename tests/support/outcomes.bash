# Ways to end a test that is a shell script before its last line. Sourced.

fail() {
  echo "FAILED: $*" >&2
  exit 1
}

# A test that cannot run on this machine prints the reason and ends with 125, which ctest reports as skipped. The programs
# end with 64 to 78, so no status of theirs is mistaken for it.
skip() {
  echo "SKIPPED: $*"
  exit 125
}
