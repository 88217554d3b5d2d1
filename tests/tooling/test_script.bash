# Shared code of the tests of the scripts. Sourced.

# shellcheck source=../support/spoiling.bash
. "$(dirname "${BASH_SOURCE[0]}")/../support/spoiling.bash"
said=

# copy_test_script SCRIPTS: scripts/test in the copy, with stand-ins for all its programs.
copy_test_script() {
  mkdir "$copy/scripts"
  cp -r "$1/lib" "$1/test" "$copy/scripts/"
  stand_in scripts/install-dependencies "echo \"\$*\" >> '$copy/installed'"
  stand_in scripts/lint
  stand_in bin/cmake
  export PATH=$copy/bin:$PATH
  last=$copy/build/release/Testing/Temporary/LastTest.log
  mkdir -p "$(dirname "$last")"
  : > "$last"
}

# says TEXT: the output must contain it.
says() { grep -qF -- "$1" <<< "$said" || fail "\"$1\" is not said in: $said"; }
is() { [ "$2" = "$3" ] || fail "$1 is \"$2\", not \"$3\": ${said:-}"; }
